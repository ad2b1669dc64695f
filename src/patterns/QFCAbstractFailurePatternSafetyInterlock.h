// The safety interlock's shared rules: which failure classes and relay
// vectors a pin's PinConfig leaves possible, which entries every candidate
// forbids, and the skeleton of one pin's check that both platforms follow.
#pragma once

#include <cstdint>
#include <vector>

#include "config/QFCAbstractFailureClasses.h"

namespace faultbox {

class QFCAbstractFailurePattern;
class QFCAbstractFailurePatternPin;

class QFCAbstractFailurePatternSafetyInterlock {
 public:
  // Positions of a requirement vector: 0 to 4 PinConfig, 5 to 42 external hardware.
  static constexpr std::size_t kRequirementPositions = 43;

  QFCAbstractFailurePatternSafetyInterlock() = default;
  virtual ~QFCAbstractFailurePatternSafetyInterlock() = default;
  QFCAbstractFailurePatternSafetyInterlock(const QFCAbstractFailurePatternSafetyInterlock&) = delete;
  QFCAbstractFailurePatternSafetyInterlock& operator=(const QFCAbstractFailurePatternSafetyInterlock&) =
      delete;

  virtual bool CheckPin(QFCAbstractFailurePatternPin* pin) = 0;
  virtual bool CheckAll() = 0;
  virtual QFCAbstractFailurePattern* GetPattern() const = 0;
  // Derives the pin's failure class. `classes` and `requirement` may be
  // nullptr: the system's classes and a requirement vector of the pin's own.
  // The platforms' part is in the hooks below.
  virtual bool CheckPinWith(QFCAbstractFailurePatternPin* pin, const QFCAbstractFailureClasses* classes,
                            std::vector<std::uint32_t>* requirement);
  // Every (class, relay vector) of the classes the pin defines, in pin file
  // order, that does not need off an entry the user switched on.
  virtual void GetPossibleFailureClasses(const QFCAbstractFailurePatternPin* pin,
                                         std::vector<QFTFoundFailureClass>& candidates);
  // Each entry that is not on becomes 2 when every candidate forbids it, else 0.
  virtual bool AdjustPinConfig(QFCAbstractFailurePatternPin* pin,
                               const std::vector<QFTFoundFailureClass>& candidates);

 protected:
  // ---- the platform's part of CheckPinSkeleton ----
  // The pin is a pattern pin of this platform.
  virtual bool IsPlatformPin(const QFCAbstractFailurePatternPin* pin) const = 0;
  // Takes out the candidates the board cannot switch.
  virtual void FilterCandidates(std::vector<QFTFoundFailureClass>& /*candidates*/) const {}
  // Fills positions from 5 on of a requirement vector the check made itself.
  virtual bool FillExternalRequirement(std::vector<std::uint32_t>& /*requirement*/) { return true; }
  // A platform rule that refuses the pin any class (the pin stays without one).
  virtual bool IsRefusedByPlatformRule(QFCAbstractFailurePatternPin* /*pin*/,
                                       const std::vector<std::uint32_t>& /*requirement*/) {
    return false;
  }

  // The twelve steps of one pin's check, with the platform's part above.
  bool CheckPinSkeleton(QFCAbstractFailurePatternPin* pin, const QFCAbstractFailureClasses* classes,
                        std::vector<std::uint32_t>* requirement);

  // The start of a full check: the system's failure classes to check
  // against, or nullptr when the check ends before it began, with its
  // result in `result`: false without a pattern or without failure classes
  // (an internal fault at `placeNoPattern` or `placeNoClasses`), true while
  // the pattern's interlock is switched off.
  const QFCAbstractFailureClasses* BeginFullCheck(int placeNoPattern, int placeNoClasses, bool& result);
  // Checks the pattern's pins in pattern order as one full check; with
  // `explicitFirst` the pins whose class is being chosen explicitly go once
  // before all. The first pin that fails ends it.
  bool CheckEveryPin(const QFCAbstractFailureClasses* classes, std::vector<std::uint32_t>* requirement,
                     bool explicitFirst);

  // A full check marks the document modified once, not once per pin: asking
  // whether the document is read-only asks the file system.
  class FullCheckScope {
   public:
    explicit FullCheckScope(QFCAbstractFailurePatternSafetyInterlock& interlock) : interlock_(interlock) {
      outer_ = interlock_.inFullCheck_;
      if (!outer_) {
        interlock_.inFullCheck_ = true;
        interlock_.markedInFullCheck_ = false;
      }
    }
    ~FullCheckScope() {
      if (!outer_) interlock_.inFullCheck_ = false;
    }
    FullCheckScope(const FullCheckScope&) = delete;
    FullCheckScope& operator=(const FullCheckScope&) = delete;

   private:
    QFCAbstractFailurePatternSafetyInterlock& interlock_;
    bool outer_;
  };

 private:
  void MarkModified();
  // Notes in the pin why it got no class: the first of no class defined,
  // none of them in the failure class file, every relay vector forbidding an
  // entry switched on (`possible` candidates before the board's filter), the
  // board, a class used up, or no relay vector fitting the requirement.
  void NoteWhyNoClass(QFCAbstractFailurePatternPin& pin, const QFCAbstractFailureClasses& classes,
                      std::size_t possible, const std::vector<std::uint32_t>& requirement) const;

  bool inFullCheck_ = false;
  bool markedInFullCheck_ = false;
  // Scratch lists reused from pin to pin: a full check of a large pattern
  // should not allocate per pin.
  std::vector<QFTFoundFailureClass> candidates_;
  std::vector<QFTFoundFailureClass> found_;
  std::vector<std::uint32_t> ownRequirement_;
};

}  // namespace faultbox
