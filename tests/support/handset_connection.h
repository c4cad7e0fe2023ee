// A virtual handset in this process, connected to the library through a caller-supplied transport.
//
//   class Switches : public HandsetTest {};
//   TEST_F(Switches, AreRead) {
//     handset().Expect("2F").Reply("2F 34 12");
//     uint16_t switches = 0;
//     EXPECT_EQ(KRAL_DIAG_GET_DIPSW_F(handle(), &switches), 1);
//     EXPECT_TRUE(HasLine(KRAL_LOG_C_HIGH_LEVEL_START, "KRAL_DIAG_GET_DIPSW_F"));
//   }
#ifndef KRAL_TESTS_SUPPORT_HANDSET_CONNECTION_H
#define KRAL_TESTS_SUPPORT_HANDSET_CONNECTION_H

#include "handset/caller_transport.h"
#include "handset/virtual_handset.h"
#include "kral/connection.h"
#include "kral/text_log.h"
#include "tests/support/phone_log.h"
#include "tests/support/test.h"

namespace kral {

// One handset and one connection to it, released at the end.
class HandsetConnection {
 public:
  explicit HandsetConnection(uint32_t port = 1, handset::Identity identity = {})
      : handset_(std::move(identity)), transport_(handset_), port_(port) {}
  ~HandsetConnection() { Disconnect(); }

  KRAL_HANDLE Connect() {
    Disconnect();
    handle_ = KRAL_ConnectServer_UserDefinedTransport(
        port_, transport_.handle_value(), transport_.context(), &handset::CallerTransport::Send,
        &handset::CallerTransport::Receive, &handset::CallerTransport::Flush);
    return handle_;
  }

  void Disconnect() {
    if (handle_ != 0) KRAL_DisconnectServer(std::exchange(handle_, 0));
  }

  handset::VirtualHandset& handset() { return handset_; }
  const handset::CallerTransport& transport() const { return transport_; }
  KRAL_HANDLE handle() const { return handle_; }

 private:
  handset::VirtualHandset handset_;
  handset::CallerTransport transport_;
  const uint32_t port_;
  KRAL_HANDLE handle_ = 0;
};

// A connected handset with its text log. When the test ends, its script must have been followed to the end and its
// handle must be unknown to the library.
class HandsetTest : public testing::Test {
 protected:
  void SetUp() override { Connect(); }

  void TearDown() override {
    EXPECT_EQ(handset().script().Problems(), "");
    const KRAL_HANDLE released = handle();
    Disconnect();
    uint16_t port = 0;
    EXPECT_EQ(KRAL_GetComPortNumber(released, &port), 0) << "the handle is still known after its release";
    KRAL_SetTargetType(0);
  }

  // Connects, again if need be. `settings` are made in front: the library-wide ones that a connection takes over.
  void Connect(const std::function<void()>& settings = {}) {
    Disconnect();
    if (settings) settings();
    ASSERT_NE(connection_.Connect(), 0u);
    log_ = std::make_unique<test::PhoneLog>(handle());
  }

  void Disconnect() {
    log_.reset();
    connection_.Disconnect();
  }

  handset::VirtualHandset& handset() { return connection_.handset(); }
  const handset::CallerTransport& transport() const { return connection_.transport(); }
  KRAL_HANDLE handle() const { return connection_.handle(); }

  // --- The text log since it was last cleared ---
  bool HasLine(uint32_t flag, std::string_view text) {
    return log_->Has(std::to_string(flag) + " " + std::string(text));
  }
  size_t CountLines(uint32_t flag, std::string_view text) {
    return log_->Count(std::to_string(flag) + " " + std::string(text));
  }
  std::string LogText() { return Joined(log_->lines()); }
  std::string ErrorText() {
    auto lines = log_->lines();
    std::erase_if(lines, [](const std::string& line) { return !line.starts_with("16 "); });
    return Joined(lines);
  }
  void ClearLog() { log_->Take(); }

 private:
  static std::string Joined(const std::vector<std::string>& lines) {
    std::string text;
    for (const std::string& line : lines) text += line + '\n';
    return text;
  }

  HandsetConnection connection_;
  std::unique_ptr<test::PhoneLog> log_;
};

}  // namespace kral

#endif
