// Texts of the numbered messages and of the numbered resource strings: our own
// wording of everything the component reports or shows by number.
#pragma once

#include <initializer_list>
#include <string>
#include <string_view>
#include <vector>

namespace faultbox {

// The text of a numbered message, with "%1" and "%2" standing for the two
// inserted texts; nullptr when the number has no text.
const char* MessageText(int number);

// The message text with both inserted texts put in. A number without a text
// still gives a readable line, so that nothing reported is ever lost.
std::string FormatMessage(int number, std::string_view first, std::string_view second);

// A numbered resource string (labels, default names, formats); nullptr when unknown.
const char* ResourceString(int id);

// A numbered resource string with its %s / %d / %i placeholders filled in
// order. Filled by hand: the format comes from a table, never from printf.
std::string ResourceText(int id, std::initializer_list<std::string_view> args = {});

// Every number that has a text, in ascending order (for completeness tests and --help listings).
std::vector<int> KnownMessageNumbers();
std::vector<int> KnownResourceStringIds();

}  // namespace faultbox
