// NV packet functions: exact requests, what counts as an answer, batch mode and its flush.
#include "kral/nv.h"

#include "commands/ftm/rf_nv.h"
#include "commands/nv/nv_item.h"
#include "frame/resource_manager.h"
#include "kral/ftm.h"
#include "tests/support/handset_connection.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using handset::NvStatus;

std::string Repeat(const char* byte, size_t count) {
  std::string text;
  for (size_t i = 0; i < count; ++i) text += std::string(" ") + byte;
  return text;
}

class Nv : public HandsetTest {
 protected:
  // The caller's buffer and status, at first 55.. and 0x1234.
  std::array<uint8_t, 200> data_ = Filled();
  uint16_t status_ = 0x1234;

  static std::array<uint8_t, 200> Filled() {
    std::array<uint8_t, 200> data;
    data.fill(0x55);
    return data;
  }
  void Forget() {
    data_ = Filled();
    status_ = 0x1234;
  }
  bool DataUntouched() const { return data_ == Filled(); }
};

TEST_F(Nv, EveryRequestIsExactAndItsReplyIsTakenFromItsOffset) {
  const std::string zeros = Repeat("00", 127);
  const struct {
    const char* name;
    std::function<uint8_t()> call;
    std::string request;
    std::string reply;
    const char* data;  // the first two bytes of the buffer afterwards
  } kRows[] = {
      {"read", [&] { return KRAL_DIAG_NV_READ_F(handle(), 453, data_.data(), 2, &status_); }, "26 C5 01 55 55 34 12",
       "26 C5 01 0A 0B 00 00", "0A 0B"},
      {"read of one subscription", [&] { return KRAL_DIAG_NV_READ_EXT_F(handle(), 453, data_.data(), 3, 2, &status_); },
       "4B 30 01 00 C5 01 03 00 55 55 34 12", "4B 30 01 00 C5 01 03 00 0A 0B 00 00", "0A 0B"},
      {"read of an element", [&] { return KRAL_DIAG_NV_READ_ARRAY_F(handle(), 453, 7, data_.data(), 2, &status_); },
       "26 C5 01 07", "26 C5 01 07 0A 0B 00 00", "0A 0B"},
      {"write", [&] { return KRAL_DIAG_NV_WRITE_F(handle(), 453, data_.data(), 1, &status_); }, "27 C5 01 55" + zeros,
       "27 00 00", "55 55"},
      {"write of more than an item holds",
       [&] { return KRAL_DIAG_NV_WRITE_F(handle(), 453, data_.data(), 200, &status_); }, "27 C5 01" + Repeat("55", 128),
       "27 C5 01 00 00", "55 55"},
      {"write of one subscription",
       [&] { return KRAL_DIAG_NV_WRITE_EXT_F(handle(), 453, data_.data(), 3, 1, &status_); },
       "4B 30 02 00 C5 01 03 00 55" + zeros + " 34 12", "4B 30 02 00 00 00", "55 55"},
      {"write of an element", [&] { return KRAL_DIAG_NV_WRITE_ARRAY_F(handle(), 453, 7, data_.data(), 1, &status_); },
       "27 C5 01 07 55" + Repeat("00", 126), "27 C5 01 00 00", "55 55"},
  };
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.name);
    Forget();
    handset().Expect(row.request).Reply(row.reply);
    EXPECT_EQ(row.call(), 1);
    EXPECT_EQ(status_, 0);
    EXPECT_EQ(HexText(ByteView(data_).first(2)), row.data);

    // The status stands at the end; only the element read takes another one than 0 for a failure.
    Forget();
    handset().Expect(row.request).Reply(row.reply.substr(0, row.reply.size() - 5) + "05 00");
    EXPECT_EQ(row.call(), std::string(row.name) == "read of an element" ? 0 : 1);
    EXPECT_EQ(status_, 5);
    EXPECT_TRUE(DataUntouched());

    Forget();
    handset().Expect(row.request).Reply(row.request.substr(0, 2));  // no room for a status
    EXPECT_EQ(row.call(), 0);
    handset().Expect(row.request).Refuse(handset::Refusal::kBadParameter);
    EXPECT_EQ(row.call(), 0);
    EXPECT_EQ(status_, 0x1234);
    EXPECT_TRUE(DataUntouched());
  }
  EXPECT_TRUE(HasLine(KRAL_LOG_FN, "KRAL_DIAG_NV_WRITE_F (iItemID = 453 , pItemData[0] = 85, iLength = 200)"));
  EXPECT_EQ(CountLines(KRAL_LOG_RET, "KRAL_DIAG_NV_READ_ARRAY_F () = PASS"), 1u);
  EXPECT_EQ(CountLines(KRAL_LOG_RET, "KRAL_DIAG_NV_READ_ARRAY_F () = FAIL"), 3u);
}

TEST_F(Nv, ReadNeedsAnAnswerAsLongAsItsRequest) {
  handset().Expect("26 C5 01 55 55 34 12").Reply("26 C5 01 0A 00 00");
  EXPECT_EQ(KRAL_DIAG_NV_READ_F(handle(), 453, data_.data(), 2, &status_), 0);
  handset().Expect("26 C5 01 07").Reply("26 C5 01 07 00 00");
  EXPECT_EQ(KRAL_DIAG_NV_READ_ARRAY_F(handle(), 453, 7, data_.data(), 3, &status_), 0);
  handset().Expect("26 C5 01 00 00").Reply("26 C5 01 00 00");
  EXPECT_EQ(KRAL_DIAG_NV_READ_F(handle(), 453, nullptr, 0, nullptr), 1);
  EXPECT_TRUE(DataUntouched());
  const uint64_t before = handset().request_count();
  EXPECT_EQ(KRAL_DIAG_NV_READ_F(handle(), 453, nullptr, 2, &status_), 0);
  EXPECT_EQ(KRAL_DIAG_NV_WRITE_F(handle(), 453, nullptr, 2, &status_), 0);
  EXPECT_EQ(KRAL_DIAG_NV_WRITE_ARRAY_F(handle(), 453, 0, nullptr, 2, &status_), 0);
  EXPECT_EQ(KRAL_DIAG_NV_WRITE_BatchQueue_SetRO_List(handle(), nullptr, 2), 0);
  EXPECT_EQ(handset().request_count(), before);
}

// --- Batch mode ------------------------------------------------------------------------------------------------------

class NvBatchMode : public Nv {
 protected:
  void SetUp() override {
    Nv::SetUp();
    ASSERT_EQ(KRAL_DIAG_NV_WRITE_SetBatchMode(handle(), 1), 1);
  }
  uint8_t Queue(uint16_t item, uint16_t length = 128) {
    return KRAL_DIAG_NV_WRITE_F(handle(), item, data_.data(), length, &status_);
  }
  uint8_t Flush() { return KRAL_DIAG_NV_WRITE_FlushBatchQueue(handle(), &last_item_, &total_status_, &item_status_); }

  uint16_t last_item_ = 1, total_status_ = 2;
  uint8_t item_status_ = 3;
};

TEST_F(NvBatchMode, TwentyItemsGoOutInThreePackets) {
  for (uint16_t item = 100; item < 120; ++item) EXPECT_EQ(Queue(item), 1);
  EXPECT_EQ(status_, 0);
  EXPECT_EQ(handset().request_count(), 0u);
  EXPECT_TRUE(HasLine(KRAL_LOG_RET, "DIAG_NV_Add_WRITE_QueueItem(iItemID = 119, iLength = 128)"));
  EXPECT_TRUE(HasLine(KRAL_LOG_RET, "DIAG_NV_Add_WRITE_QueueItem() -- Queue Size = 20"));
  EXPECT_EQ(Flush(), 1);
  const auto requests = handset().requests();
  ASSERT_EQ(requests.size(), 3u);
  const char* const heads[] = {"4B 30 00 00 09 00 A4 04 00 00", "4B 30 00 00 09 00 A4 04 00 00",
                               "4B 30 00 00 02 00 08 01 00 00"};
  for (size_t i = 0; i < 3; ++i) EXPECT_EQ(HexText(ByteView(requests[i]).first(10)), heads[i]);
  EXPECT_EQ(HexText(ByteView(requests[2]).subspan(10, 5)), "80 76 00 00 55");
  EXPECT_EQ(HexText(*handset().nv().Value(119)), Repeat("55", 128).substr(1));
  EXPECT_EQ(last_item_, 119);
  EXPECT_EQ(total_status_, 0);
  EXPECT_EQ(item_status_, 0);
  for (const char* line :
       {"KRAL_DIAG_NV_WRITE_FlushBatchQueue( ) -- Queue size = 20", "     iItemID = 100 (0x64), iLength  = 128(0x80)",
        "KRAL_DIAG_NV_WRITE_FlushBatchQueue( ) -- Number Items Written = 20"}) {
    EXPECT_TRUE(HasLine(KRAL_LOG_RET, line)) << line;
  }
  // Batch mode is over.
  EXPECT_EQ(Queue(5, 1), 1);
  EXPECT_EQ(handset().requests().size(), 4u);
}

TEST_F(NvBatchMode, LengthsAreCutAndEverySwitchClearsTheQueue) {
  EXPECT_EQ(Queue(1, 200), 1);
  EXPECT_EQ(KRAL_DIAG_NV_WRITE_ARRAY_F(handle(), 2, 9, data_.data(), 1, &status_), 1);
  handset()
      .Expect("4B 30 00 00 02 00 8A 00 00 00 80 01 00 00" + Repeat("55", 128) + " 02 02 00 00 09 55")
      .Reply("4B 30 00 00 02 00 8A 00 00 00 00 01 00 00 00 02 00 00");
  EXPECT_EQ(Flush(), 1);
  for (const uint8_t start : {1, 0}) {
    KRAL_DIAG_NV_WRITE_SetBatchMode(handle(), 1);
    Queue(1);
    EXPECT_EQ(KRAL_DIAG_NV_WRITE_SetBatchMode(handle(), start), 1);
    EXPECT_EQ(Flush(), 1);
    EXPECT_EQ(last_item_, 65535);
  }
  EXPECT_EQ(handset().requests().size(), 1u);
  // Extended writes are not queued.
  KRAL_DIAG_NV_WRITE_SetBatchMode(handle(), 1);
  EXPECT_EQ(KRAL_DIAG_NV_WRITE_EXT_F(handle(), 9, data_.data(), 1, 2, nullptr), 1);
  EXPECT_EQ(handset().nv().Value(9, 1)->at(1), 0x55);
}

TEST_F(NvBatchMode, ReadOnlyItemsOfTheListCountAsWritten) {
  handset().nv().SetReadOnly(101);
  const uint16_t list[] = {7, 101};
  EXPECT_EQ(KRAL_DIAG_NV_WRITE_BatchQueue_SetRO_List(handle(), list, 2), 1);
  EXPECT_TRUE(HasLine(KRAL_LOG_RET, "KRAL_DIAG_NV_WRITE_BatchQueue_SetRO_List( ) -- Adding NV ID #101"));
  for (const uint16_t item : {100, 101, 102}) Queue(item);
  EXPECT_EQ(Flush(), 1);
  EXPECT_EQ(last_item_, 102);
  EXPECT_EQ(total_status_, 7) << "the handset's own word";
  EXPECT_TRUE(HasLine(KRAL_LOG_RET, "     Found item in the read-only list so no failure: iNvId = 101 "));

  EXPECT_EQ(KRAL_DIAG_NV_WRITE_BatchQueue_SetRO_List(handle(), nullptr, 0), 1);
  KRAL_DIAG_NV_WRITE_SetBatchMode(handle(), 1);
  for (const uint16_t item : {100, 101, 102}) Queue(item);
  EXPECT_EQ(Flush(), 0);
  EXPECT_EQ(last_item_, 101) << "the first failing item, not the last result";
  EXPECT_EQ(item_status_, 7);
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "     Error Detected: iLastErrorNvId = 101, iLastItemStatus = 7 )"));
}

TEST_F(NvBatchMode, FailingItemOrPacketEndsTheFlush) {
  handset().nv().SetStatus(103, NvStatus::kFailed);
  for (uint16_t item = 100; item < 120; ++item) Queue(item);
  EXPECT_EQ(Flush(), 0);
  EXPECT_EQ(handset().requests().size(), 1u);
  EXPECT_EQ(last_item_, 103);
  EXPECT_EQ(item_status_, 4);
  EXPECT_TRUE(HasLine(KRAL_LOG_RET, "KRAL_DIAG_NV_WRITE_FlushBatchQueue( ) -- Number Items Written = 3"));

  const struct {
    const char* reply;
    uint16_t last_item;
  } kBroken[] = {
      {"13 4B", 65535},
      {"4B 30 00 00 01 00 02 00 00", 65535},              // ends within the total status
      {"4B 30 00 00 01 00 02 00 00 00 02 01 00", 65535},  // within an item's header
      {"4B 30 00 00 02 00 02 00 00 00 00 01 00 00 05 01 00 00 AA", 1},
      {"4B 30 00 00 00 00 00 00 00 00", 65535},                      // tells of no item
      {"4B 30 00 00 02 00 08 00 00 00 00 01 00 00 00 02 00 00", 2},  // of one more than was sent
  };
  for (const auto& broken : kBroken) {
    SCOPED_TRACE(broken.reply);
    KRAL_DIAG_NV_WRITE_SetBatchMode(handle(), 1);
    Queue(1, 2);
    handset().Expect("4B 30 00 00 01 00 06 00 00 00 02 01 00 00 55 55").Reply(broken.reply);
    EXPECT_EQ(Flush(), 0);
    EXPECT_EQ(last_item_, broken.last_item);
    EXPECT_EQ(Flush(), 1) << "the queue is empty, batch mode is off";
  }
  EXPECT_EQ(
      CountLines(KRAL_LOG_ERR, "KRAL_DIAG_NV_WRITE_FlushBatchQueue( ) -- Error occurred during send sync operation."),
      1u);
}

// --- Against the model -----------------------------------------------------------------------------------------------

TEST_F(Nv, SubscriptionsAndElementsAreKeptApart) {
  handset().nv().MakeArray(30, 2);
  const auto write = [&](uint16_t context, uint8_t value) {
    EXPECT_EQ(KRAL_DIAG_NV_WRITE_EXT_F(handle(), 20, &value, context, 1, &status_), 1);
    EXPECT_EQ(status_, 0);
  };
  write(0, 0x10);
  write(1, 0x11);
  for (const uint8_t index : {0, 1, 2}) {
    const uint8_t value = 0x20 + index;
    EXPECT_EQ(KRAL_DIAG_NV_WRITE_ARRAY_F(handle(), 30, index, &value, 1, &status_), 1);
    EXPECT_EQ(status_, index < 2 ? 0 : 6);
  }
  EXPECT_EQ(KRAL_DIAG_NV_READ_F(handle(), 20, data_.data(), 128, &status_), 1);
  EXPECT_EQ(data_[0], 0x10);
  EXPECT_EQ(KRAL_DIAG_NV_READ_EXT_F(handle(), 20, data_.data(), 1, 128, &status_), 1);
  EXPECT_EQ(data_[0], 0x11);
  EXPECT_EQ(KRAL_DIAG_NV_READ_ARRAY_F(handle(), 30, 1, data_.data(), 127, &status_), 1);
  EXPECT_EQ(data_[0], 0x21);
  EXPECT_EQ(KRAL_DIAG_NV_READ_ARRAY_F(handle(), 30, 2, data_.data(), 127, &status_), 0);
}

TEST_F(Nv, RfItemsNeedFactoryTestMode) {
  const auto phone = Kral_ResourceManager::GetPhone(handle());
  const handset::Bytes value{1, 2, 3};
  handset::Bytes read;
  EXPECT_FALSE(nv::WriteRf(*phone, 20001, value, status_));
  handset().mode().SetState(handset::ModeState::kFactoryTest);
  handset().Expect("4B 0B 24 00 01 00 21 4E 03 00 01 02 03").Reply("4B 0B 24 00 01 00 21 4E 00 00");
  EXPECT_TRUE(nv::WriteRf(*phone, 20001, value, status_));
  EXPECT_TRUE(nv::ReadRf(*phone, 20001, read, status_));
  EXPECT_EQ(status_, 5);
  EXPECT_TRUE(nv::WriteRf(*phone, 20001, value, status_));
  EXPECT_EQ(handset().efs().File("/nv/item_files/rfnv/00020001"), value);
  EXPECT_TRUE(nv::ReadRf(*phone, 20001, read, status_));
  EXPECT_EQ(read, value);
  for (const char* reply : {"4B 0B 24 00 00 00 21 4E 00 00 04 00 01 02 03", "4B 0B 24 00 00 00 22 4E 00 00 00 00",
                            "4B 0B 24 00 00 00 21 4E 00"}) {
    handset().Expect("4B 0B 24 00 00 00 21 4E").Reply(reply);
    EXPECT_FALSE(nv::ReadRf(*phone, 20001, read, status_)) << reply;
  }
  KRAL_FTM_SET_COMMAND_CODE(handle(), 59);
  const uint64_t before = handset().request_count();
  EXPECT_FALSE(nv::WriteRf(*phone, 20001, value, status_));
  EXPECT_FALSE(nv::ReadRf(*phone, 20001, read, status_));
  EXPECT_EQ(handset().request_count(), before);
}

}  // namespace
}  // namespace kral
