// A connection to a handset that already is in factory test mode.
#ifndef KRAL_TESTS_SUPPORT_FTM_FIXTURE_H
#define KRAL_TESTS_SUPPORT_FTM_FIXTURE_H

#include "kral/ftm.h"
#include "tests/support/handset_connection.h"
#include "tests/support/test.h"

namespace kral::test {

// Two bytes as they stand on the wire.
inline std::string Hex16(unsigned value) {
  const std::array<uint8_t, 2> bytes{static_cast<uint8_t>(value), static_cast<uint8_t>(value >> 8)};
  return handset::HexText(bytes);
}

class FtmTest : public HandsetTest {
 protected:
  void SetUp() override {
    HandsetTest::SetUp();
    handset().mode().SetState(handset::ModeState::kFactoryTest);
  }

  // A line of the text log: its flag, a blank, its text.
  bool Logged(const std::string& line) { return ("\n" + LogText()).find("\n" + line + "\n") != std::string::npos; }

  size_t Traffic() { return handset().requests().size(); }
  std::string LastRequest() {
    const auto requests = handset().requests();
    return requests.empty() ? "" : handset::HexText(requests.back());
  }
  uint16_t ModeId() const {
    uint16_t mode_id = 0xFFFF;
    KRAL_FTM_GET_MODE_ID(handle(), &mode_id);
    return mode_id;
  }
};

}  // namespace kral::test

#endif
