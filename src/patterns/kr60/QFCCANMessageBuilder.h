// Turns the relay states of a KR60 failure pattern into the CAN frames that
// switch them: one relay state record per module, step and direction, and
// from each record its relay frames and the commit of its step and module
// type. Also makes the reset frames of the system's hardware reset.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <set>
#include <type_traits>
#include <utility>
#include <vector>

#include "patterns/QFCAbstractMessageBuilder.h"
#include "comm/QFCCANMessage.h"

namespace faultbox {

class QFCAbstractFailurePatternPin;
class QFCKR60FailurePattern;
class QFTPossibility;

// The relay vector of one module in one step of an activation or deactivation.
struct QFTModuleRelayState {
  std::uint64_t vector;  // bit 0: relay on, bit 1: relay off
  std::uint32_t moduleAddress;
  std::int32_t step;  // from 1
  std::uint32_t moduleType;
  bool activate;
};
static_assert(std::is_standard_layout_v<QFTModuleRelayState>);
static_assert(offsetof(QFTModuleRelayState, moduleAddress) == 8 &&
              offsetof(QFTModuleRelayState, step) == 12 && offsetof(QFTModuleRelayState, moduleType) == 16 &&
              offsetof(QFTModuleRelayState, activate) == 20);

class QFCCANMessageBuilder : public QFCAbstractMessageBuilder {
 public:
  static constexpr std::uint64_t kAllRelaysOff = ~std::uint64_t{0};
  // The only selector BuildResetMessages knows.
  static constexpr int kResetSelector = 2;
  // A pin's relay positions: 0 to 4 its load channel, 5 to 42 the FIU.
  static constexpr std::size_t kPositions = 43;
  static constexpr std::size_t kFirstFiuPosition = 5;
  static constexpr std::uint32_t kLoadRelaysPerChannel = 5;
  static constexpr std::uint32_t kLoadChannels = 10;

  // The pattern is not owned and must outlive the builder.
  explicit QFCCANMessageBuilder(QFCKR60FailurePattern* pattern);
  ~QFCCANMessageBuilder() override;

  // Empties `messages`, composes the relay state records of the direction and
  // appends their frames. False, with the records that were composed, when a
  // load address cannot be read or an object is unusable.
  bool BuildMessages(QFCMessageList& messages, bool activate) override;
  void DeleteRelayStates() override;

  // The record with exactly these values; a new one starts from the vector
  // of the same module and direction with the highest step, or all relays off.
  QFTModuleRelayState* FindOrCreateRelayState(std::uint32_t address, std::int32_t step,
                                              std::uint32_t moduleType, bool activate);
  // In the order of creation, which is the order of the frames.
  const std::vector<std::unique_ptr<QFTModuleRelayState>>& GetRelayStates() const { return relayStates_; }

  // With kResetSelector appends the reset frame of the module type (FIU,
  // LOAD or RSIM; another type adds nothing) to every module of that type
  // under `offset`; true when the list then holds a frame. Any other
  // selector: false.
  static bool BuildResetMessages(int selector, std::uint32_t moduleType, QFCMessageList& messages,
                                 std::uint32_t offset);

  // Writes one relay's state into a vector: 1 switches it on (bit cleared), 0
  // off (bit set), any other state leaves it. False, with an internal fault,
  // for a channel outside 0 to 9, a relay outside 0 to 4 or an FIU position
  // outside 5 to 42.
  static bool WriteLoadRelay(std::uint64_t& vector, std::uint32_t channel, std::uint32_t relay,
                             std::uint32_t state);
  static bool WriteFiuRelay(std::uint64_t& vector, std::size_t position, std::uint32_t state);

 private:
  // State, first step, last step and the pattern's current state per relay
  // position: a pin's relay tables, or the FIU tables of all pins merged.
  struct RelayTable {
    std::array<std::uint32_t, kPositions> state{};
    std::array<std::uint32_t, kPositions> first{};
    std::array<std::uint32_t, kPositions> last{};
    std::array<std::uint32_t, kPositions> current{};
  };
  // The steps that switch relays of positions [from, to] in the direction:
  // the different non-zero step numbers, in rising order; step 1 alone when
  // every number is 0.
  static std::vector<std::uint32_t> StepsOf(const RelayTable& table, std::size_t from, std::size_t to,
                                            bool activate);
  // One step applied to the state list carried from step to step.
  static void ApplyStep(const RelayTable& table, std::size_t from, std::size_t to, std::uint32_t step,
                        bool activate, std::array<std::uint32_t, kPositions>& states);

  struct Taker {
    QFCAbstractFailurePatternPin* pin;
    RelayTable table;
    std::uint32_t address;
  };
  using ModuleKey = std::pair<std::uint32_t, std::uint32_t>;  // address, module type

  // The relay tables of the pin's adjusted relay vector; false, with an
  // internal fault, for a pin that is not of KR60 or a vector that is missing.
  static bool FillTable(QFCAbstractFailurePatternPin& pin, const QFTPossibility* possibility,
                        RelayTable& table);
  // The pins that take part in the direction; the others are deselected,
  // and those of a deactivation selected.
  bool CollectTakers(bool activate, std::vector<Taker>& takers);
  // Only the records of the pins given, in the direction, without touching
  // the pins.
  bool ComposeFor(const std::vector<Taker>& takers, bool activate);
  bool ComposeLoad(const Taker& taker, bool activate);
  bool ComposeRsim(bool activate);
  bool ComposeFiu(const std::vector<Taker>& takers, bool activate);
  // The vectors the pins already activated hold on the hardware, per module.
  std::map<ModuleKey, std::uint64_t> ActivatedEndState();
  // Gives every record the relays of the earlier steps of its module that it
  // does not switch itself, starting from `base` (else all relays off).
  void ChainSteps(const std::map<ModuleKey, std::uint64_t>& base);
  // The record's relay frames, and the commit of its step and module type
  // unless `commits` holds it already.
  using StepAndType = std::pair<std::int32_t, std::uint32_t>;
  bool AppendMessages(const QFTModuleRelayState& record, std::uint32_t offset, QFCMessageList& messages,
                      std::set<StepAndType>& commits) const;
  // Reads "FIULoadAddress" or "RSIMLoadAddress"; message 161 when it cannot.
  bool ReadModuleAddress(const char* key, std::uint32_t& address) const;
  // FindOrCreateRelayState by the record's index, which also indexes written_.
  std::size_t FindOrCreateIndex(std::uint32_t address, std::int32_t step, std::uint32_t moduleType,
                                bool activate);

  QFCKR60FailurePattern* pattern_;
  std::vector<std::unique_ptr<QFTModuleRelayState>> relayStates_;
  // Per record (same index), the bits its own pins switch.
  std::vector<std::uint64_t> written_;
};

}  // namespace faultbox
