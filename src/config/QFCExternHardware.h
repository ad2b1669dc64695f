// The external hardware a KR60 failure pattern can switch into its relay
// matrix: a potential, a resistor, a measurement input and a source, plus the
// empty item. Each item records the two matrix endpoints it connects; the
// items are plain data that the pattern stores in its own form.
#pragma once

#include <array>
#include <cstdint>
#include <string>
#include <vector>

namespace faultbox {

class Archive;

class QFCExternHardware {
 public:
  enum Type : std::int32_t {
    kEmpty = 0,
    kPotential = 1,
    kResistor = 2,
    kMeasurement = 3,
    kSource = 4,
  };

  QFCExternHardware(std::string kindText, std::int32_t type);
  virtual ~QFCExternHardware() = default;
  QFCExternHardware(const QFCExternHardware&) = delete;
  QFCExternHardware& operator=(const QFCExternHardware&) = delete;

  const std::string& GetName() const { return name_; }
  void SetName(std::string name) { name_ = std::move(name); }
  const std::string& GetKindText() const { return kindText_; }
  std::int32_t GetType() const { return type_; }

  std::int32_t GetEndpointA() const { return endpointA_; }
  std::int32_t GetEndpointB() const { return endpointB_; }
  void SetEndpoints(std::int32_t a, std::int32_t b) {
    endpointA_ = a;
    endpointB_ = b;
  }
  void SetEndpointA(std::int32_t a) { endpointA_ = a; }
  void SetEndpointB(std::int32_t b) { endpointB_ = b; }
  void Disconnect() { SetEndpoints(0, 0); }
  bool IsConnected() const { return endpointA_ != 0 && endpointB_ != 0; }
  bool IsFree() const { return endpointA_ == 0 && endpointB_ == 0; }
  // Connected between a and b, whichever way round.
  bool IsBetween(std::int32_t a, std::int32_t b) const {
    return (endpointA_ == a && endpointB_ == b) || (endpointA_ == b && endpointB_ == a);
  }

  // The pattern stores the settings itself; an item has no stored form.
  virtual void Serialize(Archive&) {}

 private:
  std::string name_;
  std::string kindText_;
  std::int32_t type_;
  std::int32_t endpointA_ = 0;
  std::int32_t endpointB_ = 0;
};

// The measurement input: besides its own endpoints, four channels with one
// endpoint each.
class QFCExternHardwareMeas : public QFCExternHardware {
 public:
  static constexpr int kChannelCount = 4;

  QFCExternHardwareMeas();

  // Channel 1 to 4; 0 for any other channel.
  std::int32_t GetChannel(int channel) const;
  // False (nothing set) for a channel outside 1 to 4.
  bool SetChannel(int channel, std::int32_t endpoint);
  void ClearChannels() { channels_.fill(0); }

 private:
  std::array<std::int32_t, kChannelCount> channels_{};
};

// The potential item: the system's five potentials and the entry for no
// potential, and which of them the resistor and the measurement refer to.
//
// A choice is kept as its index rather than as its text: a pin file may name
// several potentials "none", and a text would not tell them apart.
class QFCExternHardwarePot : public QFCExternHardware {
 public:
  static constexpr int kPotentialCount = 5;
  static constexpr int kNameCount = kPotentialCount + 1;
  static constexpr int kNoPotential = kPotentialCount;

  // The first five of `potentials` (missing ones stay empty); index 5 is the
  // text for no potential. Both choices start at no potential.
  explicit QFCExternHardwarePot(const std::vector<std::string>& potentials);

  const std::array<std::string, kNameCount>& GetNames() const { return names_; }
  // 0 to 5, or -1 when no entry has exactly that name.
  int FindPotentialIndex(const std::string& name) const;

  // Kind 2 (resistor) or 3 (measurement); -1 for another kind.
  int GetChoiceIndex(std::int32_t kind) const;
  // False (nothing changes) for another kind or an index outside 0 to 5.
  bool SetChoiceIndex(std::int32_t kind, int index);

 private:
  std::array<std::string, kNameCount> names_;
  int resistorChoice_ = kNoPotential;
  int measurementChoice_ = kNoPotential;
};

}  // namespace faultbox
