// A reply that comes after its time-out must not be taken for the next request's, where anything can tell.
#include "handset/line/faults.h"
#include "kral/diag.h"
#include "kral/error.h"
#include "kral/ftm.h"
#include "kral/nv.h"
#include "kral/transport.h"
#include "tests/support/handset_connection.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using handset::Lag;

// Longer than the time-out of the request that is answered late, shorter than that of the one behind it.
constexpr uint32_t kLateMs = 60;
constexpr int32_t kShortMs = 20;
constexpr int32_t kLongMs = 5000;

class LateReplies : public HandsetTest {
 protected:
  // The first request of `late` is answered late; then `next` is asked, which must not take that answer.
  template <class Late, class Next>
  void AskBehindALateReply(Late late, Next next) {
    handset().faults().Clear();
    handset().faults().Add(Lag(kLateMs), When::Nth(1));
    KRAL_ConfigureTimeOut(handle(), 0, kShortMs);
    EXPECT_EQ(late(), 0);
    KRAL_ConfigureTimeOut(handle(), 0, kLongMs);
    next();
  }
};

TEST_F(LateReplies, ThatRepeatTheirRequestArePassedOver) {
  const std::vector<uint8_t> seven{7, 7}, eight{8, 8};
  handset().nv().Set(100, seven);
  handset().nv().Set(101, eight);
  handset().memory().Store(0x1000, seven);
  handset().memory().Store(0x2000, eight);
  std::array<uint8_t, 128> data{};
  uint16_t status = 0;
  AskBehindALateReply([&] { return KRAL_DIAG_NV_READ_F(handle(), 100, data.data(), 128, &status); },
                      [&] {
                        EXPECT_EQ(KRAL_DIAG_NV_READ_F(handle(), 101, data.data(), 128, &status), 1);
                        EXPECT_EQ(data[0], 8);
                      });
  AskBehindALateReply([&] { return KRAL_DIAG_NV_WRITE_F(handle(), 102, seven.data(), 2, &status); },
                      [&] {
                        handset().faults().Add(handset::Refuse(handset::Refusal::kBadParameter), When::Always());
                        EXPECT_EQ(KRAL_DIAG_NV_WRITE_F(handle(), 103, seven.data(), 2, &status), 0);
                      });
  // The same item with another value, and batches of other items.
  const auto refuse = [&] { handset().faults().Add(handset::Refuse(handset::Refusal::kBadParameter), When::Always()); };
  AskBehindALateReply([&] { return KRAL_DIAG_NV_WRITE_F(handle(), 104, seven.data(), 2, &status); },
                      [&] {
                        refuse();
                        EXPECT_EQ(KRAL_DIAG_NV_WRITE_F(handle(), 104, eight.data(), 2, &status), 0);
                      });
  const auto write_batch = [&](uint16_t item) {
    uint8_t last = 0;
    KRAL_DIAG_NV_WRITE_SetBatchMode(handle(), 1);
    KRAL_DIAG_NV_WRITE_F(handle(), item, seven.data(), 2, &status);
    const uint8_t written = KRAL_DIAG_NV_WRITE_FlushBatchQueue(handle(), nullptr, nullptr, &last);
    KRAL_DIAG_NV_WRITE_SetBatchMode(handle(), 0);
    return written;
  };
  AskBehindALateReply([&] { return write_batch(105); },
                      [&] {
                        refuse();
                        EXPECT_EQ(write_batch(106), 0);
                      });
  AskBehindALateReply([&] { return KRAL_DIAG_MEMORY_PEEK_F(handle(), 0x1000, 2, data.data()); },
                      [&] {
                        EXPECT_EQ(KRAL_DIAG_MEMORY_PEEK_F(handle(), 0x2000, 2, data.data()), 1);
                        EXPECT_EQ(data[0], 8);
                      });
  AskBehindALateReply([&] { return KRAL_FTM_SET_TX_ON(handle()); },
                      [&] {
                        handset().faults().Add(handset::Lose(), When::Always());
                        KRAL_ConfigureTimeOut(handle(), 0, 2 * kLateMs);
                        EXPECT_EQ(KRAL_FTM_SET_TX_OFF(handle()), 0) << "its own answer is lost";
                      });
}

TEST_F(LateReplies, ThatRepeatNothingNeedTheLoopback) {
  uint16_t switches = 0;
  ASSERT_EQ(KRAL_DIAG_SET_DIPSW_F(handle(), 0x1111), 1);
  const auto read = [&] { return KRAL_DIAG_GET_DIPSW_F(handle(), &switches); };
  // A request of KRAL_SendSync changes the word, so that the late answer and the next one differ.
  const auto change = [&](uint16_t word) {
    const std::array<uint8_t, 3> request{48, static_cast<uint8_t>(word), static_cast<uint8_t>(word >> 8)};
    return KRAL_SendASync(handle(), 3, request.data(), kLongMs, 0);
  };
  KRAL_SetResynchronise(handle(), 1);
  AskBehindALateReply(read, [&] {
    ASSERT_EQ(change(0x2222), 1);
    EXPECT_EQ(read(), 1);
    EXPECT_EQ(switches, 0x2222);
  });
  // A request that the loopback keeps back leaves the caller's size alone.
  handset().faults().Clear();
  handset().faults().Add(handset::Lose(), When::Nth(1));
  handset().faults().Add(handset::WrongCode(77), When::From(2));
  KRAL_ConfigureTimeOut(handle(), 0, kShortMs);
  EXPECT_EQ(read(), 0);
  const uint8_t version = 0;
  std::array<uint8_t, 4> room{};
  uint16_t size = room.size();
  EXPECT_EQ(KRAL_SendSync(handle(), 1, &version, &size, room.data(), kShortMs), 0);
  EXPECT_EQ(size, room.size());
  // A silent handset costs one time-out, not one for the loopback and one for the request.
  handset().faults().Clear();
  handset().faults().Add(handset::Ignore(), When::Always());
  KRAL_ConfigureTimeOut(handle(), 0, kShortMs);
  EXPECT_EQ(read(), 0);
  const uint64_t before = handset().request_count();
  EXPECT_EQ(read(), 0);
  EXPECT_EQ(handset().request_count(), before + 1);
}

}  // namespace
}  // namespace kral
