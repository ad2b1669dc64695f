// The reporting operations and the error module behind them.
#include <gtest/gtest.h>

#include "platform/QFCReporter.h"
#include "support/MessageCapture.h"

namespace faultbox {
namespace {

TEST(ErrorReportingTest, WithoutAModuleNothingIsReported) {
  QFCReporter app;  // never started
  EXPECT_EQ(app.ReportError(47, "a"), E_FAULTBOX);
  EXPECT_EQ(app.ReportWarning(47), E_FAULTBOX);
  EXPECT_EQ(app.ReportInfo(47), E_FAULTBOX);
  EXPECT_EQ(app.ReportInternal(35, "1"), E_FAULTBOX);
  EXPECT_EQ(app.ShowReported(1, true), E_FAULTBOX);
  QFCErrorModuleAdapter& adapter = app.ErrorAdapter();
  EXPECT_EQ(adapter.SetError(3, 47, "", "", 0), E_FAULTBOX);
  EXPECT_EQ(adapter.DisplayAllErrors(1, true), 0);
  EXPECT_EQ(adapter.GetStackSize(1), 0);
  EXPECT_FALSE(adapter.IsErrorOnStack(1));
  EXPECT_EQ(adapter.ClearAllErrors(), E_FAULTBOX);
  std::string text;
  EXPECT_EQ(adapter.GetLastErrorText(1, &text, false), E_FAULTBOX);
}

TEST(ErrorReportingTest, ClassesNumbersAndTextsReachTheSink) {
  test::MessageCapture capture;
  EXPECT_EQ(TheReporter().ReportError(46, "pins.csv"), FAULTBOX_OK);
  EXPECT_EQ(TheReporter().ReportWarning(64, "a.csv", "b.csv", 1), FAULTBOX_OK);
  EXPECT_EQ(TheReporter().ReportInfo(115, "System 1"), FAULTBOX_OK);
  TheReporter().ReportInternalFault(563);

  ASSERT_EQ(capture.records.size(), 4u);
  const int classes[] = {3, 2, 1, 0};
  for (int i = 0; i < 4; ++i) EXPECT_EQ(capture.records[i].errorClass, classes[i]);
  EXPECT_EQ(capture.Numbers(), (std::vector<int>{46, 64, 115, 35}));
  EXPECT_EQ(capture.records[1].second, "b.csv");
  EXPECT_FALSE(capture.shown[0]);
  EXPECT_TRUE(capture.shown[1]);  // dialog kind 1 asks to show at once
  EXPECT_TRUE(capture.shown[3]);  // internal faults are always shown
  EXPECT_EQ(capture.records[3].first, "563");
  EXPECT_NE(capture.records[0].Text().find("pins.csv"), std::string::npos);
  EXPECT_EQ(TheReporter().Module()->GetStackSize(0), 0);  // everything shown was taken off the stack
}

TEST(ErrorReportingTest, StackOperationsWhileDisplayIsHeld) {
  test::MessageCapture capture;
  QFCErrorModuleAdapter& adapter = TheReporter().ErrorAdapter();
  adapter.SetMode(false);
  const int first = adapter.SetError(3, 46, "one", "", 0);
  const int second = adapter.SetError(2, 64, "two", "", 0);
  EXPECT_NE(first, second);
  EXPECT_EQ(adapter.DisplayAllErrors(first, false), FAULTBOX_OK);
  EXPECT_TRUE(capture.records.empty());
  EXPECT_EQ(adapter.GetStackSize(first), 2);
  EXPECT_TRUE(adapter.IsErrorOnStack(first));

  std::string text;
  EXPECT_EQ(adapter.GetLastErrorText(second, &text, true), FAULTBOX_OK);
  EXPECT_NE(text.find("two"), std::string::npos);
  EXPECT_FALSE(adapter.IsErrorOnStack(second));

  adapter.SetMode(true);
  adapter.SetError(1, 115, "three", "", 0);
  EXPECT_EQ(adapter.DisplayFirstError(first, false), FAULTBOX_OK);
  EXPECT_EQ(capture.Numbers(), (std::vector<int>{46}));
  EXPECT_EQ(adapter.DisplayLastError(first, false), FAULTBOX_OK);
  EXPECT_EQ(capture.Numbers(), (std::vector<int>{46, 115}));
  EXPECT_EQ(adapter.ClearLastError(), E_FAULTBOX);  // the stack is empty now
  EXPECT_EQ(adapter.ClearAllErrors(), FAULTBOX_OK);
}

TEST(ErrorReportingTest, AStackThatIsNeverShownStaysBounded) {
  ErrorModule module;
  module.Create(33, 0, 1, nullptr, "test");
  module.SetMode(false);
  for (std::size_t i = 0; i < ErrorModule::kMaxRecords + 5; ++i) module.SetError(1, 0, 115, std::to_string(i), "");
  EXPECT_EQ(static_cast<std::size_t>(module.GetStackSize(0)), ErrorModule::kMaxRecords);
  ErrorRecord last;
  ASSERT_TRUE(module.GetLastError(&last));
  EXPECT_EQ(last.first, std::to_string(ErrorModule::kMaxRecords + 4));
}

// The command line prints result lines in this form.
TEST(ResultCodesTest, Texts) {
  EXPECT_EQ(ResultCodeText(E_FAULTBOX_TAG_NOT_FOUND), "E_FAULTBOX_TAG_NOT_FOUND (0x80040404)");
  EXPECT_EQ(ResultCodeText(0x12345), "0x00012345");
}

}  // namespace
}  // namespace faultbox
