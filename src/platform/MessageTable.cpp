// Texts of the numbered messages and resource strings. Both tables stay sorted
// by number; the static_asserts below refuse a build that breaks the order, so
// the lookups can rely on binary search.
#include "platform/MessageTable.h"

#include <algorithm>
#include <iterator>

namespace faultbox {
namespace {

struct Entry {
  int number;
  const char* text;
};

// "%1" and "%2" stand for the first and second inserted text. A placeholder
// written as " (%1)" disappears with its brackets when that text is empty, for
// messages that some callers raise without the text.
constexpr Entry kMessages[] = {
    {34,
     "Invalid value: %1 (%2). A module address is written cabinet_rack_slot (cabinet 0 to 9, rack 0 to 15, "
     "slot 0 to 15); an offset is a hexadecimal number with upper-case digits; \"none\" stands for a part "
     "that is not fitted."},
    {35, "Internal error at place %1."},
    {37, "The value of %1 is not valid. %2"},
    {38, "The format key %1 in pin file %2 has no value; the line is ignored."},
    {39, "The mandatory column %1 is missing in pin file %2."},
    {40, "The column %1 occurs more than once in pin file %2; each column may appear only once."},
    {41, "%1 is missing or marked as not used (\"-\" or \"#\") (%2)."},
    {42,
     "The load channels do not fit %1: the number of different channels in load_module_channel must equal "
     "load_channels_required. %2"},
    {43, "A pattern pin was asked for with an index outside the pattern."},
    {45, "Pin %1 is activated and stays in the pattern; deactivate it before removing it."},
    {46, "The file %1 cannot be opened: it does not exist or cannot be read."},
    {47,
     "The tag %1 was not found in pin file %2. Every line of a pin file must end with CR LF: a file with "
     "LF-only line ends (as most Linux editors save it) reads as one single line. Convert it, for example "
     "with unix2dos, and check the spelling of the tag (tags are case-sensitive)."},
    {48, "Additional pin files: %1 entries read, list size %2."},
    {49,
     "The board type or platform does not fit here (%1). BoardType KR40, KR040, KR80 or KR080 belongs in a "
     ".fss document, KR60 or KR060 in a .fsa document; the value is case-sensitive."},
    {50, "The format key %1 is missing in pin file %2."},
    {51,
     "The hardware messages for the pattern could not be built; check the load addresses in the pin file's "
     "format block and that every pin's module is known."},
    {54, "Nothing was sent: the interface to the hardware is not connected."},
    {55, "The CAN channel could not be released when disconnecting."},
    {57,
     "The device type does not suit the platform: KR40-family systems use the RS-232 port (200), KR60 "
     "systems a CAN device (1 or 4)."},
    {58,
     "The CAN channel could not be opened, activated or deactivated; check the channel settings and the CAN "
     "interface."},
    {59,
     "The CAN channel of system %1 was already initialised by another application; its bus timing is kept."},
    {60, "The CAN bus timing could not be set for system %1; the channel was released."},
    {61, "The CAN channel could not be set up; the system is not connected."},
    {62, "Connected to the hardware."},
    {63, "The pattern cannot be activated or deactivated now: its document does not allow it at the moment."},
    {64,
     "The pin file %1 is used instead of %2, which the document names; save the document to keep the new "
     "path."},
    {65, "No answer can be awaited: no message was sent."},
    {66,
     "The document %1 is open already, with the pin file %2; close it before opening it with another pin "
     "file."},
    {67, "Activating or deactivating the pattern failed; see the previous messages for the reason."},
    {69,
     "No answer from the hardware within the time-out. Check cabling and power of the modules and the "
     "\"Timeout\" setting."},
    {72, "The pin file name must end in \"csv\"."},
    {73, "The pin file %1 is empty."},
    {75, "Read error in pin file %1; the file was closed."},
    {76, "The end of the pin file was reached while searching for the tag %1."},
    {80, "The failure class file %1 cannot be opened."},
    {81, "Data read: %1 (%2)"},
    {82, "Pin %1 is activated; its configuration was not reset."},
    {83,
     "The system cannot be opened: its pin file cannot be read, a block tag is missing, or the name is "
     "already in use. The previous messages give the details."},
    {84,
     "The system cannot be opened: its pin file lacks a column or holds an inconsistent value. The previous "
     "messages give the details."},
    {85, "System %1 has an activated pattern; deactivate it before disconnecting or closing."},
    {86, "The additional pin file %1 belongs to another platform than the main pin file."},
    {87, "A failure pattern of this name already exists; choose another name."},
    {88, "The name %1 is already used by another open system."},
    {89, "No pin of the pattern is selected; select the pins to activate or deactivate."},
    {90,
     "None of the selected pins can be activated: none has a failure class. Check their configuration and "
     "the failure classes defined for them."},
    {91, "The resistor value could not be set."},
    {92,
     "The document names the failure class file %1, the pin file names %2; the pin file's entry is used."},
    {93, "Reserved text 1 of the document (%1) differs from the current one (%2); the current one is kept."},
    {94, "A failure pattern could not be created."},
    {97,
     "Pattern %1 of this system is activated; deactivate it first (only one pattern of a system can be "
     "active)."},
    {98, "Reserved text 3 of the document (%1) differs from the current one (%2); the current one is kept."},
    {99, "Reserved text 2 of the document (%1) differs from the current one (%2); the current one is kept."},
    {100, "The resistor value %1 is out of range; allowed are 0 to 131071."},
    {101, "Module %1 sent an answer that cannot be evaluated (%2)."},
    {103, "Disconnected from the hardware."},
    {105, "The CAN receive queue was signalled but held no frames."},
    {107, "Module %1 refused the message (answer %2)."},
    {108, "Module %1 (hexadecimal address) did not answer."},
    {109, "Module %1 of pin %2 did not answer the last hardware reset or is not known; the pin is left out."},
    {110, "Hardware reset finished."},
    {111, "Empty field in a pin line of pin file %1; write \"-\" or \"#\" for a value that is not used."},
    {112, "Column %1 of the header line in pin file %2 has no name although a later column has one."},
    {113, "The FIU load module %1 did not answer the hardware reset."},
    {114, "Pin %1 occurs twice in the same ECU. %2"},
    {115, "New failure simulation system %1 created."},
    {116, "Failure simulation system %1 loaded."},
    {117, "Failure simulation system %1 closed."},
    {118, "%1 is write-protected: the change is refused. Remove the write protection of the document file."},
    {119, "The document was closed by a script; its unsaved changes were discarded."},
    {120, "The system is not connected to the hardware; connect it first and check the interface settings."},
    {125,
     "The failure class could not be set: the safety interlock does not allow it with the pin's current "
     "settings."},
    {126, "The failure class was not found in the system's failure class file (%1)."},
    {127, "The pattern has activated pins; deactivate it before changing it."},
    {128, "The potential name %1 occurs twice in the pin file."},
    {129, "The system does not allow this failure class for the pin."},
    {130, "The failure class is not defined for pin %1 (column faults_ecu of the pin file)."},
    {131, "Pin %1 of ECU %2 is left out: its ECU is disabled or it has no failure class."},
    {132, "ECU %1 cannot be disabled while a pattern is activated."},
    {133, "The CAN access layer could not be initialised (code %1)."},
    {134, "The format block of pin file %1 holds an invalid value (see the previous message)."},
    {135, "The pin file is write-protected and cannot be used."},
    {136, "ECU %1 cannot be enabled or disabled: the document is write-protected."},
    {140,
     "A pin of the pattern no longer exists in the pin file and is kept as a placeholder (%1). Remove it "
     "from the pattern or restore it in the pin file."},
    {142,
     "The value of %1 differs between the document and the pin file (%2); the pin file's value is used."},
    {143, "The document differs from its pin file and was brought up to date; save it to keep the changes."},
    {144,
     "The block tags of the pin file are in the wrong order: each of /Comment, /Format and /Signallist "
     "must come before its end tag, and /Format and /Signallist may not share a line with their end tags."},
    {145, "System %1 is connected to the same HIL simulator; disconnect it first."},
    {146, "Error in line %1 of the signal list (the /Signallist line counts as line 1)."},
    {147, "The pin line was refused at field %1: a value is invalid or missing."},
    {148, "The pin line has fewer fields than the header line has columns."},
    {149, "Pin %1 of ECU %2 was deleted from the pin file; it cannot be given a failure class."},
    {150, "Failure class %1 has no relay vector %2."},
    {151, "Available CAN channel: %1"},
    {152, "Loading pin file %1."},
    {153, "Pin file %1 loaded."},
    {154, "----------------"},
    {155, "Loading document."},
    {156, "Document loaded."},
    {157, "The default failure class file %1 is used."},
    {158,
     "The environment variable NORVIK_ROOT is not set, so the default failure class file cannot be found. "
     "Set it, or name a file in the pin file's format key FaultClassFile."},
    {161, "A module address cannot be read (%1); check the load addresses in the pin file."},
    {162, "The RSIM load module %1 did not answer the hardware reset."},
    {164, "Activating failure pattern %1."},
    {165, "Failure pattern %1 activated."},
    {166, "Deactivating failure pattern %1."},
    {167, "Failure pattern %1 deactivated."},
    {168, "The failure class file does not belong to the system's platform or fails its version check (%1)."},
    {169, "The interface settings cannot be changed while the system is connected; disconnect it first."},
    {170, "%1 is not a valid port name; write COM followed by the port number, for example COM1."},
    {171, "The serial port %1 could not be set up and was closed."},
    {172, "The serial port settings could not be applied."},
    {173, "The serial port %1 cannot be opened: it does not exist or another program uses it."},
    {174, "Module %1 did not answer correctly; the transfer was stopped."},
    {175, "No bus timing was selected; the default BTR0 %1, BTR1 %2 is used."},
    {176, "Bus timing set: BTR0 %1, BTR1 %2."},
    {177,
     "The CAN channel was set up by another application at %1 bit/s; 125000 bit/s is required. Set the "
     "channel to 125000 bit/s or close the other application."},
    {178, "The document could not be loaded or saved: %1"},
    {179, "The document %1 has file version %2, which is newer than this program reads (1)."},
    {183, "User mode %1 (service mode) is active."},
    {190, "The CAN access layer refused an operation: %1 (%2)"},
    // Front ends' own messages.
    {901, "Cannot read the file %1: %2"},
    {902, "There is no message number %1."},
    {910, "The failure class source %1 is not valid JSON: %2"},
    {911, "Failure class source %1: %2"},
    {912, "The file %1 cannot be written: %2"},
    {920, "There is no failure pattern %1 in the document %2; `faultbox doc show` lists its patterns."},
    {921, "There is no pin %1 of ECU %2 in the system's pin files (names are case-sensitive)."},
    {922, "The failure pattern does not hold pin %1 of ECU %2; add it with `faultbox pattern add-pins`."},
    {923, "There is no ECU %1 in the system's pin files (names are case-sensitive)."},
    {930, "There is no shell command %1; `help` lists the commands."},
    {931, "Shell command %1: %2"},
    {932, "The simulated bench for %1 cannot start: %2"},
    {933,
     "Pattern %1 of %2 could not be switched off, nor the hardware reset: its relays may still be switched. "
     "Reset or switch off the bench."},
    {934, "The changes to %1 were not saved; `save` in the shell saves them."},
    {940,
     "%1 is not there: %2. Nothing was switched. Name the hardware in the channel or port table of the "
     "settings, or ask for the simulated bench (--hardware sim; in Python SelectHardware(\"sim\"))."},
    {941, "%1 is connected to a simulated bench (%2): no real relay moves."},
    {942,
     "Module %1 did not acknowledge the hardware reset (answer %2): it was not reset, and its relays may "
     "still be switched."},
    {943,
     "No module answered the hardware reset of %1, so nothing is known of its relays. Check the CAN "
     "channel, the bus and the power of the bench."},
    {944,
     "The hardware reset of %1 failed: relays may still be switched. Reset again, or switch the bench off."},
    {945,
     "No selected pin of failure pattern %1 is ready for activation (its module did not answer the last "
     "reset, its ECU is disabled or it was deleted from the pin file); nothing was sent."},
};

// Numbers 6701 and 6752 are document type descriptions: newline-separated
// fields (window title, document name, new-file name, filter name, filter
// extension, type id, type name), so the extension can be read from field 5.
// Strings that callers use as printf formats carry %d/%s; no other string
// holds a '%'.
constexpr Entry kStrings[] = {
    {6701,
     "\nFaultbox KR60\nFaultbox KR60 system\nFaultbox KR60 documents (*.fsa)\n.fsa\nFaultbox.KR60Document\n"
     "Faultbox KR60 document"},
    {6704, "Faultbox component %s started."},
    {6706, "Faultbox component"},
    {6707, "Faultbox"},
    {6709, "comment"},
    {6711, "No answer from the hardware within the time-out."},
    {6712, "The board type is not supported."},
    {6713, "The index is neither a name nor a number."},
    {6714, "No failure simulation system has this name or position."},
    {6715, "Could not open file %s."},
    {6716, "A failure pattern named %s exists already in this system; choose another name."},
    {6717, "No failure pattern has this name or position."},
    {6718, "No pin of the pattern has this name or position."},
    {6719, "The name is already used by another failure simulation system."},
    {6720, "The messages for the hardware could not be prepared, sent or answered."},
    {6721, "The failure simulation system could not be connected to the hardware."},
    {6722, "The failure simulation system could not be disconnected."},
    {6723, "The answer of the hardware is corrupt or cannot be evaluated."},
    {6724, "The pin file is not consistent: a tag, a column or a valid value is missing."},
    {6725, "The failure pattern could not be activated."},
    {6726, "The failure pattern could not be deactivated."},
    {6727, "cabinet"},
    {6728, "No failure class has this name or position."},
    {6729, "There is no pin %s of ECU %s in the system's pin files (names are case-sensitive)."},
    {6731, "User mode"},
    {6732, "rack"},
    {6733, "Faultbox pin information"},
    {6735, "The pin file must be an existing file whose name ends in .csv."},
    {6740, "Pin %s of ECU %s has no failure class."},
    {6742, "The pin was deleted from the pin file."},
    {6745, "Service"},
    {6747, "Standard"},
    {6748, "A failure pattern of another system on the same HIL simulator is activated."},
    {6749, "slot"},
    {6750, "Module known, no answer to the last reset"},
    {6752,
     "\nFaultbox KR40\nFaultbox KR40 system\nFaultbox KR40 documents (*.fss)\n.fss\nFaultbox.KR40Document\n"
     "Faultbox KR40 document"},
    {6761, "No module"},
    {6762, "Module answered the last reset"},
    {6764, "No failure class"},
    {6766, "Refused: another pin of the pattern uses the same switch while external hardware is connected"},
    {6767, "The failure class is not configured."},
    {6768, "Failure patterns"},
    {6769, "Failure pattern %d"},
    {6770, "Author"},
    {6771, "ECU version"},
    {6772, "connected"},
    {6773, "not connected"},
    {6774, "Connection"},
    {6775, "Description"},
    {6776, "Pin file"},
    // Why a pin has no failure class, or is left out of an activation.
    {6777, "No failure class fits the pin."},
    {6778, "No failure class is defined for the pin (column faults_ecu of the pin file)."},
    {6779, "None of the pin's failure classes (%s) is in the system's failure class file."},
    {6780, "No relay vector of the pin's failure classes allows the PinConfig entries that are switched on."},
    {6781, "Only failure classes 1 to 3 can be used on a KR80 board; the pin defines none of them."},
    {6782, "Failure class %s is taken by as many pins as its use limit allows."},
    {6783,
     "No relay vector of the pin's failure classes fits its PinConfig entries and the pattern's external "
     "hardware."},
    {6784, "ECU %s is disabled."},
    {6785, "The pin is no longer in the pin file."},
    {6786, "Its module %s did not answer the last hardware reset."},
    {6787, "Not configured"},
    {6788, "%s (ID %d, relay vector %d)"},
    {6789, "Pin %s of ECU %s"},
    {6790, "Failure class: %s"},
    {6793, "Activate"},
    {6795, "Deactivate"},
    {6797, "New failure simulation system"},
    {6799, "System %d"},
    // Must differ from "none": potentials named "none" in a pin file would
    // otherwise be mistaken for the absence of a potential.
    {8905, "(no potential)"},
    {8906, "An unspecified error occurred."},
    {8907, "The object no longer exists: its system or failure pattern was closed or deleted."},
    {8910, "The failure simulation system is not connected to the hardware."},
    {8911, "%d %s"},
    {8912, "The failure pattern is activated; deactivate it first."},
    {8917, "Pin"},
    {8918, "ECU"},
    {8919, "Module"},
    {8920, "Channel"},
    {8921, "Failure classes"},
    {8922, "Board and channel must be decimal numbers."},
    {8923, "Relay vector %d"},
    {8926, "BTR0"},
    {8927, "BTR1"},
    {8928, "Sample point in percent"},
    {40026, "%s (board %d, channel %d)"},
};

template <std::size_t N>
constexpr bool StrictlyAscending(const Entry (&table)[N]) {
  for (std::size_t i = 1; i < N; ++i) {
    if (table[i - 1].number >= table[i].number) return false;
  }
  return true;
}
static_assert(StrictlyAscending(kMessages), "message table must be sorted without duplicates");
static_assert(StrictlyAscending(kStrings), "string table must be sorted without duplicates");

template <std::size_t N>
const char* Find(const Entry (&table)[N], int number) {
  auto it = std::lower_bound(std::begin(table), std::end(table), number,
                             [](const Entry& e, int n) { return e.number < n; });
  return it != std::end(table) && it->number == number ? it->text : nullptr;
}

template <std::size_t N>
std::vector<int> Numbers(const Entry (&table)[N]) {
  std::vector<int> out;
  out.reserve(N);
  for (const Entry& e : table) out.push_back(e.number);
  return out;
}

}  // namespace

const char* MessageText(int number) {
  return Find(kMessages, number);
}

std::string FormatMessage(int number, std::string_view first, std::string_view second) {
  const char* text = MessageText(number);
  std::string out;
  if (text == nullptr) {
    out = "Message " + std::to_string(number);
    if (!first.empty() || !second.empty()) out += ":";
    if (!first.empty()) out.append(" ").append(first);
    if (!second.empty()) out.append(" ").append(second);
    return out;
  }
  bool usedFirst = false;
  bool usedSecond = false;
  // One pass over the template: inserted texts are never scanned again, so a
  // "%2" inside the first text stays as it is.
  for (std::string_view rest = text; !rest.empty();) {
    if (rest.size() >= 5 && rest.substr(0, 3) == " (%" && (rest[3] == '1' || rest[3] == '2') &&
        rest[4] == ')') {
      std::string_view inserted = rest[3] == '1' ? first : second;
      (rest[3] == '1' ? usedFirst : usedSecond) = true;
      if (!inserted.empty()) out.append(" (").append(inserted).append(")");
      rest.remove_prefix(5);
    } else if (rest.size() >= 2 && rest[0] == '%' && (rest[1] == '1' || rest[1] == '2')) {
      out.append(rest[1] == '1' ? first : second);
      (rest[1] == '1' ? usedFirst : usedSecond) = true;
      rest.remove_prefix(2);
    } else {
      out.push_back(rest[0]);
      rest.remove_prefix(1);
    }
  }
  // A text the message has no place for is still shown, so that nothing
  // reported is lost.
  if (!usedFirst && !first.empty()) out.append(" [").append(first).append("]");
  if (!usedSecond && !second.empty()) out.append(" [").append(second).append("]");
  while (!out.empty() && out.back() == ' ') out.pop_back();
  return out;
}

const char* ResourceString(int id) {
  return Find(kStrings, id);
}

std::vector<int> KnownMessageNumbers() {
  return Numbers(kMessages);
}

std::vector<int> KnownResourceStringIds() {
  return Numbers(kStrings);
}

std::string ResourceText(int id, std::initializer_list<std::string_view> args) {
  const char* format = ResourceString(id);
  std::string text = format ? format : std::to_string(id);
  std::string out;
  auto next = args.begin();
  for (std::size_t i = 0; i < text.size(); ++i) {
    const bool placeholder = text[i] == '%' && i + 1 < text.size() &&
                             (text[i + 1] == 's' || text[i + 1] == 'd' || text[i + 1] == 'i');
    if (placeholder && next != args.end()) {
      out += *next++;
      ++i;
    } else {
      out += text[i];
    }
  }
  return out;
}

}  // namespace faultbox
