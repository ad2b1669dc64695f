// The pin file line reader: CR LF lines, quotes next to separators, the
// whole-field tag rule and the checks made when opening.
#include "config/QFCCSVFileParser.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include "support/MessageCapture.h"
#include "support/RunProcess.h"

namespace faultbox {
namespace {

using test::MessageCapture;

TEST(CSVFileParserTest, OnlyCrLfEndsALine) {
  test::TempDir dir;
  QFCCSVFileParser parser;
  ASSERT_TRUE(parser.Open(dir.Write("a.csv", "one\r\ntwo\nstill two\rand\r\n\r\nlast\r")));
  std::vector<std::string> lines;
  std::int32_t position = 0;
  std::int32_t next = 0;
  std::string line;
  while (parser.ReadLineAt(line, position, next, false)) {
    lines.push_back(line);
    position = next;
  }
  EXPECT_EQ(lines, (std::vector<std::string>{"one", "two\nstill two\rand", "", "last\r"}));
  ASSERT_TRUE(parser.ReadLineAt(line, 5, next, true));
  EXPECT_EQ(line, "two still two\rand");
  EXPECT_FALSE(parser.ReadLineAt(line, parser.GetEndPosition(), next, false));
  EXPECT_FALSE(parser.ReadLineAt(line, -1, next, false));

  // ReadLine follows the file position that the last read left.
  ASSERT_TRUE(parser.ReadLineAt(line, 0, next, false));
  ASSERT_TRUE(parser.ReadLine(line));
  EXPECT_EQ(line, "two\nstill two\rand");
  parser.Close();
  EXPECT_FALSE(parser.ReadLine(line));
}

TEST(CSVFileParserTest, QuotesGoOnlyNextToSeparators) {
  const std::pair<const char*, const char*> cases[] = {
      {"\"a\";\"b\"", "\"a;b\""}, {"x;\"\";y", "x;;y"},     {"say \"hi\";ok", "say \"hi;ok"},
      {"a;\"\"b", "a;\"b"},       {"\"only\"", "\"only\""},
  };
  test::TempDir dir;
  for (const auto& [raw, read] : cases) {
    QFCCSVFileParser parser;
    ASSERT_TRUE(parser.Open(dir.Write("q.csv", raw)));
    std::string line;
    std::int32_t next = 0;
    ASSERT_TRUE(parser.ReadLineAt(line, 0, next, true));
    EXPECT_EQ(line, read) << raw;
  }
}

TEST(CSVFileParserTest, WholeFieldTagRule) {
  struct Case {
    const char* line;
    const char* tag;
    bool holds;
    std::int32_t column;
  };
  const Case cases[] = {
      {"/Comment", "/Comment", true, 0},
      {"  /Comment;;  ", "/Comment", true, 0},
      {"/Comment text;", "/Comment", true, -1},
      {"/Comment\ttext", "/Comment", true, -1},
      {"/CommentEnd;", "/Comment", false, -1},
      {";;/Signallist;", "/Signallist", true, 2},
      {";;/Signallist", "/Signallist", false, 2},  // after a ";" at the line's end: not found
      {"x; /Format;", "/Format", false, -1},
      {"/Comment;/CommentEnd", "/CommentEnd", false, 1},
      {"/Comment;/CommentEnd;", "/CommentEnd", true, 1},
      {"/SignallistEnd;/Signallist;", "/Signallist", false, 1},  // only the first occurrence counts
      {"/Signallist;x;/Signallist;", "/Signallist", true, 2},    // the last equal field gives the column
      {"/comment;", "/Comment", false, -1},
      {"/Comment\nnext line", "/Comment", false, -1},  // a lone LF is no white space here
  };
  for (const Case& c : cases) {
    EXPECT_EQ(QFCCSVFileParser::HoldsTag(c.line, c.tag), c.holds) << c.line;
    EXPECT_EQ(QFCCSVFileParser::TagColumnOf(c.line, c.tag), c.column) << c.line;
  }
}

TEST(CSVFileParserTest, FindTag) {
  test::TempDir dir;
  QFCCSVFileParser parser;
  ASSERT_TRUE(parser.Open(dir.Write("t.csv", "head\r\nx;/Format;\r\n/FormatEnd\r\n/Format;\r\nlast")));
  MessageCapture cap;
  EXPECT_EQ(parser.FindTag("/Format", 0), 6);
  EXPECT_EQ(parser.GetTagColumn(), 1);
  EXPECT_EQ(parser.FindTag("/FormatEnd", 0), 18);
  EXPECT_EQ(parser.GetTagColumn(), 1);  // end tags leave the column alone
  EXPECT_EQ(parser.FindTag("/Format", 18), 30);
  EXPECT_EQ(parser.GetTagColumn(), 0);
  EXPECT_TRUE(cap.records.empty());
  EXPECT_EQ(parser.FindTag("/Signallist", 0), -1);
  ASSERT_EQ(cap.Numbers(), std::vector<int>{76});
  EXPECT_EQ(cap.records[0].errorClass, 0);
  EXPECT_EQ(cap.records[0].first, "/Signallist");
  cap.Clear();
  EXPECT_EQ(parser.FindTag("/Format", parser.GetEndPosition()), -1);
  EXPECT_EQ(parser.FindTag("/Format", -1), -1);
  EXPECT_TRUE(cap.records.empty());
}

TEST(CSVFileParserTest, OpenChecks) {
  test::TempDir dir;
  mkdir(dir.File("folder.csv").c_str(), 0755);
  struct Case {
    std::string path;
    bool opens;
    std::vector<int> numbers;
  };
  const Case cases[] = {
      {"", false, {}},
      {dir.Write("pins.txt", "x"), false, {72}},
      {"sv", false, {72}},
      {dir.File("absent.csv"), false, {46}},
      {dir.File("folder.csv"), false, {46}},
      {dir.Write("empty.csv", ""), false, {73}},
      {dir.Write("UPPER.CSV", "x"), true, {}},
      {dir.Write("nodotcsv", "x"), true, {}},
      {dir.Write("win/style.csv", "x").replace(dir.Path().size() + 4, 1, "\\"), true, {}},
  };
  for (const Case& c : cases) {
    QFCCSVFileParser parser;
    MessageCapture cap;
    EXPECT_EQ(parser.Open(c.path), c.opens) << c.path;
    EXPECT_EQ(cap.Numbers(), c.numbers) << c.path;
    for (const auto& r : cap.records) EXPECT_EQ(r.errorClass, 0);
  }
}

}  // namespace
}  // namespace faultbox
