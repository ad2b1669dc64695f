// Result codes of every operation of the component: the automation error codes
// that model operations return unchanged up to scripts and front ends.
#pragma once

#include <cstdint>
#include <string>

namespace faultbox {

using HRESULT = std::int32_t;

[[nodiscard]] constexpr HRESULT MakeCode(std::uint32_t value) { return static_cast<HRESULT>(value); }

constexpr HRESULT FAULTBOX_OK = 0;
constexpr HRESULT S_OK = 0;
constexpr HRESULT S_FALSE = 1;
constexpr HRESULT E_FAIL = MakeCode(0x80004005u);
constexpr HRESULT E_NOTIMPL = MakeCode(0x80004001u);
constexpr HRESULT E_FAULTBOX = MakeCode(0x80004005u);
constexpr HRESULT E_FAULTBOX_NULL_POINTER = MakeCode(0x80004003u);
constexpr HRESULT E_FAULTBOX_INVALID_PARAMETER = MakeCode(0x80070057u);
constexpr HRESULT E_FAULTBOX_CANN_NOT_OPEN_FILE = MakeCode(0x80040400u);
constexpr HRESULT E_FAULTBOX_FILE_IS_NOT_OPENED = MakeCode(0x80040401u);
constexpr HRESULT E_FAULTBOX_NAME_NOT_UNIQUE = MakeCode(0x80040402u);
constexpr HRESULT E_FAULTBOX_INITIALIZE = MakeCode(0x80040403u);
constexpr HRESULT E_FAULTBOX_TAG_NOT_FOUND = MakeCode(0x80040404u);
constexpr HRESULT E_FAULTBOX_HEADER_COL_NOT_FOUND = MakeCode(0x80040405u);
constexpr HRESULT E_FAULTBOX_CONSISTENCY_CHECK = MakeCode(0x80040406u);
constexpr HRESULT W_FAULTBOX_PIN_NOT_USED_FOR_FAULT_INJECTION = MakeCode(0x80040407u);
constexpr HRESULT E_FAULTBOX_PIN_WAS_DELETED_FROM_PIN_FILE = MakeCode(0x80040408u);
constexpr HRESULT E_FAULTBOX_BOARD_TYPE_IS_NOT_SUPORTED = MakeCode(0x80040409u);
constexpr HRESULT E_FAULTBOX_MSG_WAS_NOT_TRANSMITED = MakeCode(0x8004040Au);
constexpr HRESULT E_FAULTBOX_TRANSMITED_MSG_WAS_NOT_RESPONDING = MakeCode(0x8004040Bu);
constexpr HRESULT E_FAULTBOX_RECEIVE_MESSAGE = MakeCode(0x8004040Cu);
constexpr HRESULT E_FAULTBOX_CONNECT = MakeCode(0x8004040Du);
constexpr HRESULT E_FAULTBOX_DISCONNECT = MakeCode(0x8004040Eu);
constexpr HRESULT E_FAULTBOX_OTHER_SYSTEM_FOR_SAME_HIL_IS_ACTIVATED = MakeCode(0x8004040Fu);
constexpr HRESULT E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE = MakeCode(0x80040410u);
constexpr HRESULT E_FAULTBOX_MESSAGE_BUILD = MakeCode(0x80040411u);
constexpr HRESULT E_FAULTBOX_TIME_OUT = MakeCode(0x80040412u);
constexpr HRESULT E_FAULTBOX_EVALUATE_MESSAGE = MakeCode(0x80040413u);
constexpr HRESULT E_FAULTBOX_ACTIVATE_FAILURE_PATTERN = MakeCode(0x80040414u);
constexpr HRESULT E_FAULTBOX_DEACTIVATE_FAILURE_PATTERN = MakeCode(0x80040415u);
constexpr HRESULT E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED = MakeCode(0x80040416u);
constexpr HRESULT E_FAULTBOX_FAILURECLASS_NOT_CONFIGURATED = MakeCode(0x80040417u);

constexpr bool Succeeded(HRESULT hr) { return hr >= 0; }
constexpr bool Failed(HRESULT hr) { return hr < 0; }

// The constant's name ("E_FAULTBOX_TAG_NOT_FOUND"), or "" for an unknown code.
// E_FAIL and E_FAULTBOX share their value; the name given is "E_FAULTBOX".
const char* ResultCodeName(HRESULT hr);
// The code's description as scripts see it ("The TAG was not found."), or "".
const char* ResultCodeDescription(HRESULT hr);
// "E_FAULTBOX_TAG_NOT_FOUND (0x80040404)", or just the number for unknown codes.
std::string ResultCodeText(HRESULT hr);

}  // namespace faultbox
