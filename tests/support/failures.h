// Calls that fail, and the record that each must leave.
#ifndef KRAL_TESTS_SUPPORT_FAILURES_H
#define KRAL_TESTS_SUPPORT_FAILURES_H

#include "kral/error.h"
#include "tests/support/test.h"

namespace kral::test {

// What a record says but for its sentence: "KRAL_EfsRead REFUSED EFS 2", with "line 5" and "offset 0" where it has
// them.
inline std::string Described(const KRAL_ERROR& error) {
  static const std::vector<std::string> kCodes = {" NONE",        " INTERNAL",  " ARGUMENT", " NO_PORT",
                                                  " PORT_IN_USE", " NO_ANSWER", " LINK",     " REFUSED",
                                                  " MISMATCH",    " LOST",      " BAD_FILE", " SAFETY_STOP"};
  static const std::vector<std::string> kStatusKinds = {"",     " REFUSAL ", " REPLY ",   " EFS ",
                                                        " NV ", " LOADER ",  " COMMAND ", " RESULT "};
  std::string text = error.function + (error.code == KRAL_ERROR_ABORTED ? " ABORTED" : kCodes.at(error.code));
  if (error.status_kind != 0 || error.status != 0) {
    text += kStatusKinds.at(error.status_kind) + std::to_string(error.status);
  }
  const auto add = [&](uint32_t bit, const char* name, uint64_t value) {
    if ((error.present & bit) != 0 || value != 0) text += name + std::to_string(value);
  };
  add(KRAL_ERROR_HAS_LINE, " line ", error.line);
  add(KRAL_ERROR_HAS_OFFSET, " offset ", error.offset);
  return text;
}

struct FailureRow {
  std::string record;
  std::string text;  // a part of the sentence
  std::function<uint32_t()> call;
  bool of_system = false;  // the system's own number is in the record
};

// Makes each call after `prepare`; all give 0.
inline void ExpectFailures(
    KRAL_HANDLE handle, const std::vector<FailureRow>& rows, const std::function<void()>& prepare = [] {}) {
  for (const FailureRow& row : rows) {
    SCOPED_TRACE(row.record + ": " + row.text);
    prepare();
    EXPECT_EQ(row.call(), 0u);
    KRAL_ERROR error{};
    ASSERT_EQ(KRAL_GetLastError(handle, &error), 1);
    EXPECT_EQ(Described(error), row.record) << error.text;
    EXPECT_NE(std::string(error.text).find(row.text), std::string::npos) << error.text;
    EXPECT_TRUE(!row.of_system || error.system_error != 0);
  }
}

}  // namespace kral::test

#endif
