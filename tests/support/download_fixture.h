// A connected handset whose flash programmer runs, with time-outs short enough to wait for.
#ifndef KRAL_TESTS_SUPPORT_DOWNLOAD_FIXTURE_H
#define KRAL_TESTS_SUPPORT_DOWNLOAD_FIXTURE_H

#include "download/link/download_settings.h"
#include "frame/diag_ftm.h"
#include "frame/resource_manager.h"
#include "kral/diag.h"
#include "kral/download.h"
#include "tests/support/handset_connection.h"
#include "tests/support/test.h"

namespace kral::test {

class DownloadTest : public HandsetTest {
 protected:
  void SetUp() override {
    HandsetTest::SetUp();
    KRAL_SetReceiveMode(handle(), 1);
    KRAL_STREAM_ConfigureHello(handle(), 2, 1);
  }

  // For acknowledgements that do not come; everything else may take its time on a busy machine.
  void AcknowledgeWithin(uint32_t milliseconds) { settings().acknowledge_limit_ms = milliseconds; }
  download::Settings& settings() { return Kral_ResourceManager::GetPhone(handle())->state<download::Settings>(); }

  // The programmer runs and has been greeted.
  void StartProgrammer(handset::ProgrammerSettings settings = {}) {
    handset().programmer().Set(settings);
    handset().EnterMode(handset().programmer_mode());
    ASSERT_EQ(KRAL_STREAM_HELLO(handle(), KRAL_STREAM_HELLO_VARIANT, &block_size_, &window_), 1) << LogText();
  }
  void StartLoader() { ASSERT_EQ(KRAL_DIAG_DLOAD_F(handle()), 1) << LogText(); }

  uint32_t WriteMem(const std::vector<uint8_t>& bytes, uint32_t address = 0, uint8_t method = KRAL_STREAM_MULTI_IMAGE,
                    const std::vector<uint8_t>& header = {}) {
    uint32_t result = UINT32_MAX;
    const uint8_t written =
        KRAL_STREAM_WriteImageMem(handle(), bytes.data(), static_cast<uint32_t>(bytes.size()), address, 7,
                                  header.empty() ? nullptr : header.data(), static_cast<uint32_t>(header.size()),
                                  method, block_size_, window_, &result);
    EXPECT_EQ(written, result == KRAL_STREAM_WRITTEN ? 1 : 0);
    return result;
  }

  static std::vector<uint8_t> RandomBytes(size_t size, uint32_t seed = 1) {
    std::mt19937 random(seed);
    std::vector<uint8_t> bytes(size);
    for (uint8_t& byte : bytes) byte = static_cast<uint8_t>(random());
    return bytes;
  }

  // Packets of the programmer that begin with a code.
  size_t CountPackets(uint8_t code) {
    size_t count = 0;
    for (const auto& packet : handset().programmer().packets()) count += packet[0] == code ? 1 : 0;
    return count;
  }

  // The call, struck by the fault at the first replies from now on that `when` picks.
  uint8_t Struck(handset::Fault fault, const handset::When& when, const std::function<uint8_t()>& call) {
    handset().faults().Clear();
    handset().faults().Add(fault, when);
    const uint8_t result = call();
    handset().faults().Clear();
    return result;
  }

  // Replies are lost, and silence is not awaited for long. Everything else may take its time on a busy machine.
  uint8_t Silent(const handset::When& when, const std::function<uint8_t()>& call) {
    settings().handshake_limit_ms = 50;
    AcknowledgeWithin(30);
    KRAL_ConfigureTimeOut(handle(), 0, 250);
    const uint8_t result = Struck(handset::Lose(), when, call);
    settings().handshake_limit_ms = UINT32_MAX;
    AcknowledgeWithin(UINT32_MAX);
    KRAL_ConfigureTimeOut(handle(), 0, 2000);
    return result;
  }

  uint8_t Aborted(const std::function<uint8_t()>& call) {
    const auto abort = [](KRAL_HANDLE phone, uint32_t, uint32_t, uintptr_t) { KRAL_AbortDownload(phone); };
    KRAL_ConfigureDownloadCallBack(handle(), abort, 0);
    const uint8_t result = call();
    KRAL_ConfigureDownloadCallBack(handle(), nullptr, 0);
    return result;
  }

  uint32_t block_size_ = 0;
  uint16_t window_ = 0;
};

}  // namespace kral::test

#endif
