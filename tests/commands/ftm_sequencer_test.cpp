// The sequencer's seam, driven by a double: queue mode, full queue, batch mode, sequencer commands.
#include "commands/ftm/ftm_sequencer.h"

#include "commands/ftm_settings.h"
#include "frame/diag_ftm.h"
#include "frame/resource_manager.h"
#include "tests/support/ftm_fixture.h"
#include "tests/support/test.h"

namespace kral {
namespace {

class FakeSequencer : public FtmSequencer {
 public:
  bool Add(std::span<const uint8_t> request, uint16_t& sequence_id) override {
    if (queue.size() >= capacity) return false;
    queue.push_back(HexText(request));
    sequence_id = ++last_id;
    return true;
  }
  size_t queued() const override { return queue.size(); }
  bool SendQueue(Diag_FTM&) override {
    sent += queue.size();
    return true;
  }
  void ClearQueue() override { queue.clear(); }
  uint32_t Process(Diag_FTM&, std::span<const uint8_t> command) override {
    processed.push_back(HexText(command));
    return process_result;
  }
  bool active() const override { return is_active; }
  void Observe(std::span<const uint8_t> request) override { observed.push_back(HexText(request)); }
  bool holds_back() const override { return batch; }

  size_t capacity = 2;
  std::deque<std::string> queue;
  std::vector<std::string> processed;
  std::vector<std::string> observed;
  uint16_t last_id = 0;
  size_t sent = 0;
  uint32_t process_result = 0;
  bool is_active = false;
  bool batch = false;
};

class SequencerTest : public test::FtmTest {
 protected:
  void SetUp() override {
    FtmTest::SetUp();
    settings().sequencer = &sequencer_;
  }
  void TearDown() override {
    settings().sequencer = nullptr;
    FtmTest::TearDown();
  }
  ftm::Settings& settings() { return Kral_ResourceManager::GetPhone(handle())->state<ftm::Settings>(); }
  FakeSequencer sequencer_;
};

TEST_F(SequencerTest, QueueModeCollectsAndAFullQueueIsSentFirst) {
  settings().queue_mode = 1;
  EXPECT_EQ(KRAL_FTM_SET_CHAN(handle(), 1), 1);
  EXPECT_TRUE(Logged("4 Assigned Sequence ID=1"));
  EXPECT_EQ(KRAL_FTM_SET_CHAN(handle(), 2), 1);
  EXPECT_EQ(sequencer_.sent, 0u);
  EXPECT_EQ(KRAL_FTM_SET_CHAN(handle(), 3), 1);
  EXPECT_EQ(sequencer_.sent, 2u);
  EXPECT_EQ(sequencer_.queue, std::deque<std::string>{"4B 0B 01 00 08 00 03 00"});
  EXPECT_EQ(settings().sequence_id, 3);
  EXPECT_TRUE(Logged("4 m_Command_Queue_Buffer is full, needs to send 2 commands to sequencer"));
  sequencer_.capacity = 0;
  EXPECT_EQ(KRAL_FTM_SET_CHAN(handle(), 4), 0);
  EXPECT_TRUE(Logged("16 Failed to add command to queue"));
  EXPECT_EQ(Traffic(), 0u);
}

TEST_F(SequencerTest, HeldBackRequestIsNotSentAndCountsAsFailed) {
  sequencer_.is_active = true;
  EXPECT_EQ(KRAL_FTM_SET_TX_ON(handle()), 1);
  sequencer_.batch = true;
  const size_t traffic = Traffic();
  EXPECT_EQ(KRAL_FTM_SET_TX_ON(handle()), 0);
  EXPECT_EQ(Traffic(), traffic);
  EXPECT_EQ(sequencer_.observed.size(), 2u);
  EXPECT_TRUE(Logged("2 FTM_Sequencer_ProcessClientRequestPacket( iRequestPacketSize = 6 )"));
}

TEST_F(SequencerTest, SequencerCommandsGoToTheSequencerOrOnToTheHandsetWithoutOne) {
  std::array<uint8_t, 8> response{};
  uint16_t size = 0;
  const auto send = [&] {
    size = response.size();
    return KRAL_FTM_SendCommandTo(handle(), 37, 0, 5, nullptr, 0, response.data(), &size);
  };
  EXPECT_EQ(send(), 1);
  EXPECT_EQ(size, 0) << "nothing was received";
  EXPECT_EQ(sequencer_.processed, std::vector<std::string>{"4B 0B 25 00 05 00"});
  sequencer_.process_result = 3;
  EXPECT_EQ(send(), 0);
  EXPECT_EQ(Traffic(), 0u);
  settings().sequencer = nullptr;
  EXPECT_EQ(send(), 1);
  EXPECT_EQ(LastRequest(), "4B 0B 25 00 05 00");
}

}  // namespace
}  // namespace kral
