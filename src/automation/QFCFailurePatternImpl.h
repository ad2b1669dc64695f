// A failure pattern as scripts see it: the members both platforms share, and
// the KR40 and KR60 wrappers a pattern is handed out as.
#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "automation/QFCOwnerProvider.h"

namespace faultbox {

class QFCAbstractFailurePattern;
class QFCFailurePatternPinsImpl;

class QFCBaseFailurePatternImpl : public QFCOwnerProvider<QFCAbstractFailurePattern> {
 public:
  // The pattern's one wrapper, made on first use as the wrapper of its
  // platform; nullptr for a pattern of neither platform.
  static std::shared_ptr<QFCBaseFailurePatternImpl> Of(QFCAbstractFailurePattern& pattern);

  [[nodiscard]] HRESULT get_Pins(std::shared_ptr<QFCFailurePatternPinsImpl>& failurePatternPins);
  [[nodiscard]] HRESULT get_Name(std::string& name);
  [[nodiscard]] HRESULT IsActivated(VARIANT_BOOL& isActivated);
  // Omitted `pins`: the whole pattern. An array of pin objects: the pins of
  // this pattern among them whose state differs. Every element is checked
  // before anything is switched. Message 165 or 167 on success.
  [[nodiscard]] HRESULT Activate(const Variant& pins = {});
  [[nodiscard]] HRESULT Deactivate(const Variant& pins = {});
  // E_FAULTBOX_FAILURE_PATTERN_ARE_ACTIVATED, changing nothing, while a pin
  // is activated.
  [[nodiscard]] HRESULT Reset();

  void Detach() override;

 protected:
  explicit QFCBaseFailurePatternImpl(QFCAbstractFailurePattern* owner) : QFCOwnerProvider(owner) {}

 private:
  [[nodiscard]] HRESULT Switch(const Variant& pins, bool activate);

  std::shared_ptr<QFCFailurePatternPinsImpl> pins_;
};

class QFCFailurePatternKR40Impl : public QFCBaseFailurePatternImpl {
 public:
  explicit QFCFailurePatternKR40Impl(QFCAbstractFailurePattern* owner) : QFCBaseFailurePatternImpl(owner) {}
};

class QFCFailurePatternKR60Impl : public QFCBaseFailurePatternImpl {
 public:
  explicit QFCFailurePatternKR60Impl(QFCAbstractFailurePattern* owner) : QFCBaseFailurePatternImpl(owner) {}

  // "0x..." in upper-case hex: the FIU vector with the bit of every FIU relay
  // (position 5 on) that a pin's adjusted relay vector switches on cleared.
  [[nodiscard]] HRESULT get_FIURelayState(std::string& state);
  // The RSIM relay word in the same form, with the resistor when it is connected.
  [[nodiscard]] HRESULT get_RsimRelayState(std::string& state);
  [[nodiscard]] HRESULT get_ResistorValue(std::int32_t& value);
  [[nodiscard]] HRESULT put_ResistorValue(std::int32_t value);
};

}  // namespace faultbox
