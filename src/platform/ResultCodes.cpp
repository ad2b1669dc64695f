// Names and descriptions of the result codes, for front ends and error information.
#include "platform/ResultCodes.h"

#include <cstdio>

namespace faultbox {
namespace {

struct CodeInfo {
  HRESULT code;
  const char* name;
  const char* description;
};

constexpr CodeInfo kCodes[] = {
    {FAULTBOX_OK, "FAULTBOX_OK", "No error occurred"},
    {E_FAULTBOX, "E_FAULTBOX", "An unspecified error occurred"},
    {E_NOTIMPL, "E_NOTIMPL", "Not implemented"},
    {S_FALSE, "S_FALSE", "False"},
    {E_FAULTBOX_NULL_POINTER, "E_FAULTBOX_NULL_POINTER", "Invalid pointer"},
    {E_FAULTBOX_INVALID_PARAMETER, "E_FAULTBOX_INVALID_PARAMETER", "Invalid parameter"},
    {E_FAULTBOX_CANN_NOT_OPEN_FILE, "E_FAULTBOX_CANN_NOT_OPEN_FILE", "Could not open file"},
    {E_FAULTBOX_FILE_IS_NOT_OPENED, "E_FAULTBOX_FILE_IS_NOT_OPENED", "File is not opened"},
    {E_FAULTBOX_NAME_NOT_UNIQUE, "E_FAULTBOX_NAME_NOT_UNIQUE", "The failure simulation system name is not unique"},
    {E_FAULTBOX_INITIALIZE, "E_FAULTBOX_INITIALIZE", "Initialize error"},
    {E_FAULTBOX_TAG_NOT_FOUND, "E_FAULTBOX_TAG_NOT_FOUND", "The TAG was not found."},
    {E_FAULTBOX_HEADER_COL_NOT_FOUND, "E_FAULTBOX_HEADER_COL_NOT_FOUND", "The header col was not found"},
    {E_FAULTBOX_CONSISTENCY_CHECK, "E_FAULTBOX_CONSISTENCY_CHECK",
     "The consistency check of pin file was not successfully"},
    {W_FAULTBOX_PIN_NOT_USED_FOR_FAULT_INJECTION, "W_FAULTBOX_PIN_NOT_USED_FOR_FAULT_INJECTION",
     "The pin is not used for failure simulation"},
    {E_FAULTBOX_PIN_WAS_DELETED_FROM_PIN_FILE, "E_FAULTBOX_PIN_WAS_DELETED_FROM_PIN_FILE",
     "The pin was deleted from pin file"},
    {E_FAULTBOX_BOARD_TYPE_IS_NOT_SUPORTED, "E_FAULTBOX_BOARD_TYPE_IS_NOT_SUPORTED", "The board type is not suported"},
    {E_FAULTBOX_MSG_WAS_NOT_TRANSMITED, "E_FAULTBOX_MSG_WAS_NOT_TRANSMITED", "The mesage was not transmited"},
    {E_FAULTBOX_TRANSMITED_MSG_WAS_NOT_RESPONDING, "E_FAULTBOX_TRANSMITED_MSG_WAS_NOT_RESPONDING",
     "The transmited message was not responding"},
    {E_FAULTBOX_RECEIVE_MESSAGE, "E_FAULTBOX_RECEIVE_MESSAGE", "The receive message was corrupt"},
    {E_FAULTBOX_CONNECT, "E_FAULTBOX_CONNECT", "The failure simulation system cann be not connected"},
    {E_FAULTBOX_DISCONNECT, "E_FAULTBOX_DISCONNECT", "The failure simulation system cann be not disconnected"},
    {E_FAULTBOX_OTHER_SYSTEM_FOR_SAME_HIL_IS_ACTIVATED, "E_FAULTBOX_OTHER_SYSTEM_FOR_SAME_HIL_IS_ACTIVATED",
     "The failure pattern from other failure simulation system is activated for same HIL simulator."},
    {E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE, "E_FAULTBOX_NOT_CONNECTED_TO_HARDWARE",
     "The failure simulation system is not connected to Norvik hardware"},
    {E_FAULTBOX_MESSAGE_BUILD, "E_FAULTBOX_MESSAGE_BUILD", "The message build error"},
    {E_FAULTBOX_TIME_OUT, "E_FAULTBOX_TIME_OUT", "The time out for receive messages is elapsed"},
    {E_FAULTBOX_EVALUATE_MESSAGE, "E_FAULTBOX_EVALUATE_MESSAGE", "The evaluate message error"},
    {E_FAULTBOX_ACTIVATE_FAILURE_PATTERN, "E_FAULTBOX_ACTIVATE_FAILURE_PATTERN",
     "The activate of failure pattern was not successfully"},
    {E_FAULTBOX_DEACTIVATE_FAILURE_PATTERN, "E_FAULTBOX_DEACTIVATE_FAILURE_PATTERN",
     "The deactivate of failure pattern was not successfully"},
    {E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED, "E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED",
     "The failure pattern is activated"},
    {E_FAULTBOX_FAILURECLASS_NOT_CONFIGURATED, "E_FAULTBOX_FAILURECLASS_NOT_CONFIGURATED",
     "The failure class is not configurated"},
};

const CodeInfo* Find(HRESULT hr) {
  for (const auto& info : kCodes)
    if (info.code == hr) return &info;
  return nullptr;
}

}  // namespace

const char* ResultCodeName(HRESULT hr) {
  const CodeInfo* info = Find(hr);
  return info ? info->name : "";
}

const char* ResultCodeDescription(HRESULT hr) {
  const CodeInfo* info = Find(hr);
  return info ? info->description : "";
}

std::string ResultCodeText(HRESULT hr) {
  char number[16];
  std::snprintf(number, sizeof number, "0x%08X", static_cast<unsigned>(hr));
  const CodeInfo* info = Find(hr);
  if (!info) return number;
  return std::string(info->name) + " (" + number + ")";
}

}  // namespace faultbox
