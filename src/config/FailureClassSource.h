// The readable source form of a failure class set (JSON): what users write
// and what `faultbox fcd build` turns into a failure class file. The format is
// described in docs/failure-classes.md.
#pragma once

#include <cstddef>
#include <memory>
#include <string>
#include <string_view>

#include "config/QFCAbstractFailureClasses.h"
#include "platform/ResultCodes.h"

namespace faultbox {

// Message numbers of the source check (class 3). 910: the text is not JSON
// (first text: the source, second: where and why). 911: a value is refused
// (first text: the source with the class, relay vector and position it
// belongs to; second: what is wrong).
constexpr int kMsgFailureClassSourceSyntax = 910;
constexpr int kMsgFailureClassSourceValue = 911;

// The most positions a relay vector of a source may have.
constexpr std::size_t kMaxSourcePositions = 1024;
// The largest step number a source may give (the step lookups answer signed).
constexpr std::uint32_t kMaxSourceStep = 0x7FFFFFFF;

// Builds the collection a source describes. Every refused value is reported
// (message 911, up to a bounded number of reports); any refusal, or text that
// is not JSON (message 910), gives E_FAULTBOX_CONSISTENCY_CHECK and no
// collection. `sourceName` names the source in the messages.
[[nodiscard]] HRESULT ParseFailureClassSource(std::string_view text, const std::string& sourceName,
                                std::unique_ptr<QFCAbstractFailureClasses>* out);

// The source text of a collection. Parsing it gives an equal collection back
// whenever the collection holds only values a source accepts (which every
// collection built from a source does).
std::string FailureClassSourceText(const QFCAbstractFailureClasses& classes);

}  // namespace faultbox
