// A failure class: one kind of failure a pin can be given, with its relay
// vectors ("possibilities") and the count of pins that hold it.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace faultbox {

class Archive;

// What a relay vector asks of one relay position.
constexpr std::uint32_t kRelayAny = 0;  // does not matter
constexpr std::uint32_t kRelayOn = 1;
constexpr std::uint32_t kRelayOff = 2;

// Positions 0 to 4 are the load channel (PinConfig) relays, 5 to 42 the
// external hardware; the two groups are addressed by number.
constexpr std::size_t kRelayPositions = 43;
constexpr int kGroupExternal = 1;  // positions 5 to 42
constexpr int kGroupLoad = 2;      // positions 0 to 4

// One relay vector: per position the relay state, the first number
// (activation step, 0 = every step) and the second number (deactivation step).
// The three lists always have the same length. A vector read from a file may
// be shorter than 43 positions; every reader sees a missing position as 0.
class QFTPossibility {
 public:
  // The vector a new possibility starts as: 43 positions, all off, numbers 0.
  QFTPossibility() : QFTPossibility(kRelayPositions, kRelayOff) {}
  QFTPossibility(std::size_t positions, std::uint32_t state)
      : relayStates_(positions, state), firstNumbers_(positions, 0), secondNumbers_(positions, 0) {}

  std::size_t Size() const { return relayStates_.size(); }
  std::uint32_t RelayState(std::size_t position) const { return At(relayStates_, position); }
  std::uint32_t FirstNumber(std::size_t position) const { return At(firstNumbers_, position); }
  std::uint32_t SecondNumber(std::size_t position) const { return At(secondNumbers_, position); }
  // Sets one position; positions beyond the end are added (as 0) first.
  void Set(std::size_t position, std::uint32_t state, std::uint32_t first, std::uint32_t second);

  const std::vector<std::uint32_t>& RelayStates() const { return relayStates_; }

  // Bit j set when position j is on; positions from 64 on have no bit.
  std::uint64_t RelayMask() const;

  void Serialize(Archive& ar);

  bool operator==(const QFTPossibility&) const = default;

 private:
  static std::uint32_t At(const std::vector<std::uint32_t>& list, std::size_t position) {
    return position < list.size() ? list[position] : 0;
  }

  std::vector<std::uint32_t> relayStates_;
  std::vector<std::uint32_t> firstNumbers_;
  std::vector<std::uint32_t> secondNumbers_;
};

class QFCAbstractFailureClass {
 public:
  // The archive schema of both failure class types.
  static constexpr std::uint16_t kSchema = 1;

  virtual ~QFCAbstractFailureClass() = default;

  // The name this class type is stored under in a failure class file.
  virtual const char* GetClassName() const = 0;

  // Moves the selected possibility one place later or earlier in the list;
  // the selection follows it. False when there is nothing to move.
  virtual bool MoveSelectedPossibilityLater();
  virtual bool MoveSelectedPossibilityEarlier();
  // True when another use may be taken: no limit (0) or fewer uses than the limit.
  virtual bool CanUse() const;
  virtual void ResetUses() { useCount_ = 0; }
  virtual bool HasPossibility(int index) const;
  virtual std::int32_t GetUseLimit() const { return useLimit_; }
  virtual void SetUseLimit(std::int32_t limit) { useLimit_ = limit; }
  virtual bool TryUse();
  virtual void Clear();

  // The class record (what follows the object tag in the file).
  virtual void Serialize(Archive& ar);

  std::int32_t GetId() const { return id_; }
  void SetId(std::int32_t id) { id_ = id; }
  const std::string& GetName() const { return name_; }
  void SetName(std::string name) { name_ = std::move(name); }
  const std::string& GetDescription() const { return description_; }
  void SetDescription(std::string text) { description_ = std::move(text); }
  const std::string& GetLimitation() const { return limitation_; }
  void SetLimitation(std::string text) { limitation_ = std::move(text); }
  const std::string& GetFormat() const { return format_; }
  void SetFormat(std::string text) { format_ = std::move(text); }
  // The three values a failure class file carries without giving them a meaning.
  std::int32_t GetStoredValue(int which) const;
  void SetStoredValue(int which, std::int32_t value);

  // -1 when none is selected.
  std::int32_t GetSelectedPossibility() const { return selected_; }
  // Accepts -1 or the index of a possibility.
  bool SetSelectedPossibility(std::int32_t index);

  std::int32_t GetUseCount() const { return useCount_; }
  // Gives back one use; never goes below 0.
  void ReleaseUse();

  int GetPossibilityCount() const { return static_cast<int>(possibilities_.size()); }
  // nullptr when `index` names no possibility.
  const QFTPossibility* GetPossibility(int index) const;
  QFTPossibility* GetPossibility(int index);
  // The 64-bit relay mask of a possibility; false when the index is invalid.
  bool GetRelayMask(int index, std::uint64_t& mask) const;
  // True when possibility `index` accepts the requirement vector `states`
  // (1 = position is on, 0 = off): a position it needs on must be on, one it
  // needs off must be off, and one it does not care about may be either.
  // Positions beyond `states` are not judged; positions the possibility lacks
  // do not matter.
  bool MatchesStates(int index, const std::vector<std::uint32_t>& states) const;
  // True when `value` is among the first numbers (`inFirst`) or second numbers
  // of possibility `index` within the group (kGroupExternal or kGroupLoad).
  bool FindNumber(int index, std::uint32_t value, int group, bool inFirst) const;
  // The largest first (`ofFirst`) or second number of the selected possibility
  // over the group's positions (any other group: positions 0 to 42); -1 when
  // none is selected, -2 when the class has no possibilities.
  std::int32_t GetMaxNumber(int group, bool ofFirst) const;
  // The different first or second numbers of possibility `index` within the
  // group, in rising order: the steps a message builder has to walk. Bounded
  // by the number of positions, whatever the numbers are.
  std::vector<std::uint32_t> GetNumbers(int index, int group, bool ofFirst) const;

  // Appends a new possibility of 43 positions, all off.
  void AddPossibility() { possibilities_.emplace_back(); }
  void AddPossibility(QFTPossibility possibility) { possibilities_.push_back(std::move(possibility)); }
  // Removes the selected possibility; the selection stays on its index while
  // that still names a possibility, else becomes -1. False when none is selected.
  bool RemoveSelectedPossibility();

 protected:
  QFCAbstractFailureClass() = default;

 private:
  std::int32_t id_ = 0;
  std::string name_;
  std::string description_;
  std::string limitation_;
  std::string format_;
  std::int32_t selected_ = -1;
  std::int32_t useLimit_ = 0;
  std::int32_t useCount_ = 0;  // not stored
  std::int32_t storedValues_[3] = {0, 0, 0};
  std::vector<QFTPossibility> possibilities_;
};

}  // namespace faultbox
