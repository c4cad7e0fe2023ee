// A handset in its boot loader, played byte by byte: what it says after each write of the host.
#ifndef KRAL_TESTS_SUPPORT_BOOT_WIRE_H
#define KRAL_TESTS_SUPPORT_BOOT_WIRE_H

#include "download/boot/kivrat.h"
#include "frame/diag_ftm.h"
#include "frame/resource_manager.h"
#include "kral/connection.h"
#include "tests/support/test.h"
#include "tests/support/test_wire.h"

namespace kral::test {

class BootWireTest : public testing::Test {
 protected:
  void SetUp() override {
    const UserTransport user = wire_.AsUserTransport();
    handle_ =
        KRAL_ConnectServer_UserDefinedTransport(1, user.handle, user.context, user.send, user.receive, user.flush);
    phone_ = Kral_ResourceManager::GetPhone(handle_);
    phone_->state<kivrat::Settings>().read_time_out_ms = 100;
    phone_->state<kivrat::Settings>().settle_ms = 0;
  }
  void TearDown() override {
    phone_.reset();
    KRAL_DisconnectServer(handle_);
  }

  // The target says the first of them, and each of the others for one write of the host. Empty: nothing.
  void Say(std::vector<Bytes> says, bool byte_by_byte = false) {
    ASSERT_TRUE(phone_->BorrowPort());
    says_.assign(says.begin(), says.end());
    byte_by_byte_ = byte_by_byte;
    wire_.ToHost(SayNext());
    wire_.OnWrite([this](const Bytes&) { return SayNext(); });
  }
  Bytes SayNext() {
    if (says_.empty()) return {};
    const Bytes next = says_.front();
    says_.pop_front();
    if (!byte_by_byte_) return next;
    for (const uint8_t byte : next) wire_.ToHost({byte});
    return {};
  }

  TestWire wire_;
  KRAL_HANDLE handle_ = 0;
  std::shared_ptr<Diag_FTM> phone_;
  std::deque<Bytes> says_;
  bool byte_by_byte_ = false;
};

}  // namespace kral::test

#endif
