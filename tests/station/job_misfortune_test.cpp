// Handsets of a job that are silent, slow, refuse, or vanish, while others finish; aborts at every moment.
#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <thread>

#include "tests/support/station_fixture.h"

namespace kral {
namespace {

using handset::VirtualHandset;
using handset::When;
using test::StationTest;
using namespace std::chrono_literals;

constexpr uint32_t kTenSecondsMs = 10000;

class JobMisfortune : public StationTest {
 protected:
  // A handset whose flash programmer runs, also after it was plugged in again.
  VirtualHandset& AddProgrammed(uint16_t port) {
    VirtualHandset& handset = AddSocket(port);
    handset.SetStartMode(handset.programmer_mode());
    handset.EnterMode(handset.programmer_mode());
    handset.programmer().KeepPackets(false);
    return handset;
  }

  template <class Holds>
  static bool Soon(Holds holds) {
    const auto end = std::chrono::steady_clock::now() + 60s;
    while (!holds() && std::chrono::steady_clock::now() < end) std::this_thread::sleep_for(1ms);
    return holds();
  }

  bool HasEnded(uint32_t number) { return Progress(number).state >= KRAL_VENTRIMS_PASSED; }
};

// The acknowledgement of the n-th write, of all images.
When Acknowledgement(uint64_t n) {
  return When::Nth(n).Of("08");
}

TEST_F(JobMisfortune, ChangesNothingForTheOthers) {
  const std::string first = AddBytes("first.bin", Pattern(20000));    // 20 writes
  const std::string second = AddBytes("second.bin", Pattern(30000));  // 30 writes
  struct Row {
    const char* what;
    std::function<void(VirtualHandset&, Diag_FTM&)> prepare;
    uint32_t state;
    uint32_t code;
    const char* step;
    const char* reason;
    uint32_t attempts;
  };
  const auto well = [](VirtualHandset&, Diag_FTM&) {};
  const Row rows[] = {
      {"well", well, KRAL_VENTRIMS_PASSED, KRAL_ERROR_NONE, "image 2", "", 1},
      {"silent",
       [](VirtualHandset& handset, Diag_FTM& phone) {
         handset.faults().Add(handset::Lose(), When::Always());
         phone.state<download::Settings>().handshake_limit_ms = 20;
       },
       KRAL_VENTRIMS_FAILED, KRAL_ERROR_NO_ANSWER, "image 1", "no answer", 1},
      {"slow", [](VirtualHandset& handset, Diag_FTM&) { handset.programmer().Set({.acknowledge_delay_ms = 5}); },
       KRAL_VENTRIMS_PASSED, KRAL_ERROR_NONE, "image 2", "", 1},
      {"refuses", [](VirtualHandset& handset, Diag_FTM&) { handset.programmer().Set({.open_status = 3}); },
       KRAL_VENTRIMS_FAILED, KRAL_ERROR_REFUSED, "image 1", "refused to open", 1},
      {"returns",
       [](VirtualHandset& handset, Diag_FTM&) { handset.faults().Add(handset::HangUp(), Acknowledgement(30)); },
       KRAL_VENTRIMS_PASSED, KRAL_ERROR_NONE, "image 2", "", 2},
      {"returns in diagnostics",
       [](VirtualHandset& handset, Diag_FTM& phone) {
         handset.faults().Add(handset::HangUp(), Acknowledgement(30));
         handset.SetStartMode(nullptr);
         phone.state<download::Settings>().handshake_limit_ms = 100;
       },
       KRAL_VENTRIMS_FAILED, KRAL_ERROR_LOST, "image 2", "without its flash programmer", 1},
      {"well, too", well, KRAL_VENTRIMS_PASSED, KRAL_ERROR_NONE, "image 2", "", 1},
  };
  constexpr uint16_t kFirstPort = 11;
  SetOptions(0, 1);
  ASSERT_EQ(AddImage(first, 1), 1);
  ASSERT_EQ(AddImage(second, 2), 1);
  std::vector<VirtualHandset*> handsets;
  for (const Row& row : rows) {
    const auto port = static_cast<uint16_t>(kFirstPort + handsets.size());
    handsets.push_back(&AddProgrammed(port));
    row.prepare(*handsets.back(), Phone(AddToJob(port)));
  }
  ASSERT_EQ(KRAL_VENTRIMS_Start(job_), 1) << Error().text;
  for (const uint32_t unplugged : {4, 5}) {
    ASSERT_TRUE(Soon([&] { return Progress(unplugged).state == KRAL_VENTRIMS_RETURNING; }));
    handsets[unplugged]->PlugIn();
  }
  ASSERT_EQ(KRAL_VENTRIMS_Wait(job_, 120000), 1);
  for (uint32_t number = 0; number < std::size(rows); ++number) {
    const Row& row = rows[number];
    const KRAL_VENTRIMS_RESULT result = Result(number);
    EXPECT_EQ(result.progress.state, row.state) << row.what << ": " << result.error.text;
    EXPECT_EQ(result.error.code, row.code) << row.what << ": " << result.error.text;
    EXPECT_NE(std::string(result.error.text).find(row.reason), std::string::npos) << row.what << result.error.text;
    EXPECT_EQ(std::string(result.progress.step_name).substr(0, 7), row.step) << row.what;
    EXPECT_EQ(result.progress.attempts, row.attempts) << row.what;
    if (row.state == KRAL_VENTRIMS_PASSED) {
      EXPECT_EQ(result.progress.bytes_done, 50000u) << row.what;
    }
  }
  const auto images = handsets[4]->programmer().images();
  ASSERT_EQ(images.size(), 3u);
  EXPECT_EQ(images[0].type, 1) << "the image that was closed is not written again";
  EXPECT_TRUE(images[0].closed);
  EXPECT_EQ(images[1].type, 2);
  EXPECT_EQ(images[2].type, 2);
  EXPECT_TRUE(images[2].closed);
  const KRAL_VENTRIMS_STATE state = State();
  EXPECT_EQ(state.passed, 4u);
  EXPECT_EQ(state.failed, 3u);
}

// The cable comes back at the first try to open the port: nothing but the lost one tells of it.
TEST_F(JobMisfortune, WhatComesBackInRestoreAndVerifyIsTheSameHandsetOrTheEndOfTheWork) {
  struct Row {
    const char* what;
    bool restores;
    bool between_steps;
    uint32_t serial;  // of what comes back
  };
  constexpr uint32_t kPort = 11;
  constexpr Row kRows[] = {{"restore", true, false, kPort},         {"verify", false, false, kPort},
                           {"another in restore", true, false, 12}, {"another in verify", false, false, 12},
                           {"between steps", true, true, kPort},    {"another between steps", true, true, 12}};
  const std::string backup = AddBackup();
  for (const Row& row : kRows) {
    VirtualHandset& handset = AddSocket(kPort);
    if (!row.restores) {
      for (uint16_t id = 10; id < 40; ++id) handset.nv().Set(id, handset::Bytes{static_cast<uint8_t>(id)});
    }
    ports_.SetBeforeOpen([&](uint16_t) {
      if (!handset.vanished()) return;
      handset.nv().Set(handset::kSerialNumberItem, handset::ByteWriter().U32(row.serial).Take());
      handset.PlugIn();
    });
    if (job_ == 0) job_ = KRAL_VENTRIMS_Create();
    AddToJob(kPort);
    SetOptions(0, 1);
    ASSERT_EQ(
        row.restores ? KRAL_VENTRIMS_AddRestore(job_, backup.c_str()) : KRAL_VENTRIMS_AddVerify(job_, backup.c_str()),
        1);
    if (row.between_steps) {
      const auto at_the_second = [](KRAL_VENTRIMS_JOB job, uint32_t number, uintptr_t value) {
        KRAL_VENTRIMS_PROGRESS progress{};
        progress.size = sizeof progress;
        KRAL_VENTRIMS_GetProgress(job, number, &progress);
        if (progress.step == 1 && progress.step_done == 0 && progress.attempts == 1 &&
            progress.state == KRAL_VENTRIMS_WORKING) {
          reinterpret_cast<VirtualHandset*>(value)->HangUp();
        }
      };
      KRAL_VENTRIMS_SetCallback(job_, at_the_second, reinterpret_cast<uintptr_t>(&handset));
    } else {
      handset.faults().Add(handset::HangUp(), When::Nth(6).Of("26"));  // behind five that tell of items
    }
    RunToEnd();
    const KRAL_VENTRIMS_RESULT result = Result(0);
    const bool same = row.serial == kPort;
    EXPECT_EQ(result.passed, same ? 1u : 0u) << row.what << ": " << result.error.text;
    if (same) {
      EXPECT_EQ(result.progress.attempts, 2u) << row.what;
    } else {
      EXPECT_EQ(result.error.code, uint32_t{KRAL_ERROR_LOST}) << row.what << ": " << result.error.text;
      EXPECT_STREQ(result.error.text, "another handset came back on COM11: 0000000C, not 0000000B") << row.what;
    }
    if (row.restores) {
      EXPECT_EQ(handset.nv().Value(39).has_value(), same) << row.what;
    }
    EXPECT_STREQ(result.progress.serial, "0000000B") << row.what;
    EXPECT_EQ(KRAL_VENTRIMS_Free(std::exchange(job_, 0)), 1);
    ports_.SetBeforeOpen({});
    ports_.Remove(kPort);
  }
}

TEST_F(JobMisfortune, WhatComesBackFromTheRestartIsTheHandsetThatWasFlashed) {
  struct Swap {
    VirtualHandset& handset;
    uint32_t serial;  // of what is in the socket by then
  };
  const auto at_the_restart = [](KRAL_VENTRIMS_JOB job, uint32_t number, uintptr_t value) {
    KRAL_VENTRIMS_PROGRESS progress{};
    progress.size = sizeof progress;
    KRAL_VENTRIMS_GetProgress(job, number, &progress);
    const auto& swap = *reinterpret_cast<const Swap*>(value);
    if (std::string(progress.step_name) == "restart")
      swap.handset.nv().Set(handset::kSerialNumberItem, handset::ByteWriter().U32(swap.serial).Take());
  };
  const std::string backup = AddBackup();
  const std::string programmer = folder_.Add("programmer.hex", kProgrammerHex);
  const std::string software = AddBytes("software.bin", handset::MakeSoftware("VHS-2.0.1", 3000));
  for (const uint32_t serial : {11u, 12u, 0u}) {
    Swap swap{AddSocket(11), serial};
    if (job_ == 0) job_ = KRAL_VENTRIMS_Create();
    AddToJob(11);
    SetOptions(KRAL_VENTRIMS_ENTER_LOADER | KRAL_VENTRIMS_RESET, 2);
    KRAL_VENTRIMS_AddProgrammer(job_, programmer.c_str(), KRAL_VENTRIMS_PROGRAMMER_HEX);
    AddImage(software);
    KRAL_VENTRIMS_AddRestore(job_, backup.c_str());
    KRAL_VENTRIMS_SetCallback(job_, at_the_restart, reinterpret_cast<uintptr_t>(&swap));
    RunToEnd();
    const KRAL_VENTRIMS_RESULT result = Result(0);
    const bool is_other = serial == 12;
    EXPECT_EQ(result.passed, is_other ? 0u : 1u) << serial << ": " << result.error.text;
    EXPECT_EQ(swap.handset.nv().Value(39).has_value(), !is_other) << "restored";
    if (is_other) {
      EXPECT_STREQ(result.error.text, "another handset came back on COM11: 0000000C, not 0000000B");
      EXPECT_STREQ(result.progress.serial, "0000000B");
      EXPECT_EQ(result.progress.attempts, 1u);
    }
    EXPECT_EQ(KRAL_VENTRIMS_Free(std::exchange(job_, 0)), 1);
    ports_.Remove(11);
  }
}

TEST_F(JobMisfortune, APortIsNotAwaitedForEver) {
  AddProgrammed(11).faults().Add(handset::HangUp(), Acknowledgement(5));
  AddToJob(11);
  SetOptions(0, 1, 50);
  ASSERT_EQ(AddImage(AddBytes("image.bin", Pattern(20000))), 1);
  RunToEnd();
  EXPECT_EQ(Result(0).error.code, static_cast<uint32_t>(KRAL_ERROR_LOST));
  EXPECT_NE(std::string(Result(0).error.text).find("did not return within 50 ms"), std::string::npos)
      << Result(0).error.text;
}

TEST_F(JobMisfortune, SilenceInsideAnImageIsToldAsSuchWithinTheJobsTimeOuts) {
  AddProgrammed(11).faults().Add(handset::Ignore(), When::From(12));  // from the seventh write on
  AddToJob(11);
  Phone(0).state<download::Settings>().acknowledge_limit_ms = 10;
  SetOptions(0, 1, 50);
  ASSERT_EQ(AddImage(AddBytes("image.bin", Pattern(20000))), 1);
  RunToEnd();
  EXPECT_EQ(Result(0).error.code, static_cast<uint32_t>(KRAL_ERROR_NO_ANSWER));
  EXPECT_NE(std::string(Result(0).error.text).find("stopped answering"), std::string::npos) << Result(0).error.text;
  EXPECT_LT(Result(0).progress.elapsed_ms, 3000u) << "five waits of a whole second each";
}

TEST_F(JobMisfortune, AnAbortEndsWhateverIsUnderWay) {
  VirtualHandset& writing = AddProgrammed(11);
  writing.faults().Add(handset::Lose(), When::From(5).Of("08"));
  AddProgrammed(12);  // waits
  AddToJob(11);
  AddToJob(12);
  SetOptions(0, 0, 30000, 1);
  ASSERT_EQ(AddImage(AddBytes("image.bin", Pattern(20000))), 1);
  struct Calls {
    const std::thread::id caller = std::this_thread::get_id();
    std::atomic<bool> of_caller{false};
    std::atomic<bool> of_waiting{false};
  } calls;
  const auto on_change = [](KRAL_VENTRIMS_JOB, uint32_t handset, uintptr_t value) {
    auto& told = *reinterpret_cast<Calls*>(value);
    if (std::this_thread::get_id() == told.caller) told.of_caller = true;
    if (handset == 1) told.of_waiting = true;
  };
  ASSERT_EQ(KRAL_VENTRIMS_SetCallback(job_, on_change, reinterpret_cast<uintptr_t>(&calls)), 1);
  ASSERT_EQ(KRAL_VENTRIMS_Start(job_), 1) << Error().text;
  ASSERT_TRUE(Soon([this] { return Progress(0).bytes_done > 0; }));
  EXPECT_EQ(KRAL_VENTRIMS_Wait(job_, 0), 0);
  KRAL_PORT_INFO info{};
  EXPECT_EQ(KRAL_GetPortInfo(11, 1, &info), 1);
  EXPECT_EQ(info.answers, uint32_t{KRAL_ANSWERS_NOT_ASKED}) << "asked behind the step, or in between";
  EXPECT_EQ(info.state, uint32_t{KRAL_PORT_OPEN});
  EXPECT_FALSE(HasEnded(0)) << "the step was waited for";
  EXPECT_EQ(KRAL_VENTRIMS_Abort(job_, 1), 1);
  EXPECT_EQ(Result(1).progress.state, KRAL_VENTRIMS_ABORTED) << "at once: it had not begun";
  EXPECT_EQ(KRAL_VENTRIMS_Abort(job_, 0), 1);
  EXPECT_EQ(KRAL_VENTRIMS_Wait(job_, kTenSecondsMs), 1) << "ten time-outs without an acknowledgement take longer";
  const KRAL_VENTRIMS_RESULT result = Result(0);
  EXPECT_EQ(result.progress.state, KRAL_VENTRIMS_ABORTED);
  EXPECT_EQ(result.error.code, static_cast<uint32_t>(KRAL_ERROR_ABORTED));
  EXPECT_TRUE(calls.of_waiting) << "its end is told as well";
  EXPECT_FALSE(calls.of_caller) << "who may hold a lock that the callback takes";
}

TEST_F(JobMisfortune, AHelloThatDoesNotComeInTimeIsNotAwaitedOnceMore) {
  AddSocket(11).faults().Add(handset::Ignore(), When::Always());
  AddToJob(11);
  KRAL_VENTRIMS_OPTIONS options{};
  options.size = sizeof options;
  ASSERT_EQ(KRAL_VENTRIMS_GetOptions(job_, &options), 1);
  options.hello_ms = 50;
  options.retries = 2;
  ASSERT_EQ(KRAL_VENTRIMS_SetOptions(job_, &options), 1);
  const auto programmer = AddBytes("programmer.bin", Pattern(2000));
  ASSERT_EQ(KRAL_VENTRIMS_AddProgrammer(job_, programmer.c_str(), KRAL_VENTRIMS_PROGRAMMER_BOOT), 1);
  RunToEnd();
  EXPECT_NE(std::string(Result(0).error.text).find("no hello within 50 ms"), std::string::npos) << Result(0).error.text;
  EXPECT_EQ(Result(0).progress.attempts, 1u);
}

TEST_F(JobMisfortune, ALoaderMayComeAsANewDevice) {
  VirtualHandset& handset = AddSocket(11);
  handset.SetStartMode({std::shared_ptr<void>(), &handset.loader()});
  handset.faults().Add(handset::HangUp(), When::Nth(1).Of("3A"));
  ports_.SetBeforeOpen([&](uint16_t) {
    if (handset.vanished()) handset.PlugIn();
  });
  AddToJob(11);
  SetOptions(KRAL_VENTRIMS_ENTER_LOADER, 0);
  KRAL_VENTRIMS_AddProgrammer(job_, folder_.Add("programmer.hex", kProgrammerHex).c_str(),
                              KRAL_VENTRIMS_PROGRAMMER_HEX);
  AddImage(AddBytes("image.bin", Pattern(3000)));
  RunToEnd();
  EXPECT_EQ(Result(0).passed, 1u) << Result(0).error.text;
  ports_.SetBeforeOpen({});
}

TEST_F(JobMisfortune, AProgrammerThatNeverSaysHelloIsGreetedOnce) {
  AddSocket(11).faults().Add(handset::Lose(), When::Always().Of("02").LongerThan(5));  // the hello
  AddToJob(11);
  SetOptions(KRAL_VENTRIMS_ENTER_LOADER, 2);
  ASSERT_EQ(KRAL_VENTRIMS_AddProgrammer(job_, folder_.Add("programmer.hex", kProgrammerHex).c_str(),
                                        KRAL_VENTRIMS_PROGRAMMER_HEX),
            1);
  Phone(0).state<download::Settings>().handshake_limit_ms = 20;
  RunToEnd();
  EXPECT_EQ(Result(0).error.code, uint32_t{KRAL_ERROR_NO_ANSWER}) << Result(0).error.text;
  EXPECT_EQ(Result(0).progress.attempts, 1u);
}

TEST_F(JobMisfortune, FreeingEndsAJobThatRuns) {
  VirtualHandset& silent = AddSocket(11);
  silent.faults().Add(handset::Ignore(), When::Always());
  AddToJob(11);
  KRAL_ConfigureTimeOut(Progress(0).handle, KRAL_TIME_OUT_COMMAND, 60000);
  ASSERT_EQ(KRAL_VENTRIMS_AddIdentity(job_), 1);
  ASSERT_EQ(KRAL_VENTRIMS_Start(job_), 1) << Error().text;
  ASSERT_TRUE(Soon([&] { return silent.request_count() > 0; }));
  const auto start = std::chrono::steady_clock::now();
  EXPECT_EQ(KRAL_VENTRIMS_Free(std::exchange(job_, 0)), 1);
  EXPECT_LT(std::chrono::steady_clock::now() - start, 10s);
  EXPECT_FALSE(ports_.IsOpen(11));
}

TEST_F(JobMisfortune, SixteenHandsetsWithAbortsAndUnplugs) {
  constexpr uint32_t kHandsets = 16;
  ASSERT_EQ(AddImage(AddBytes("image.bin", Pattern(60000))), 1);
  SetOptions(0, 2);
  std::vector<VirtualHandset*> handsets;
  for (uint32_t number = 0; number < kHandsets; ++number) {
    const auto port = static_cast<uint16_t>(20 + number);
    handsets.push_back(&AddProgrammed(port));
    AddToJob(port);
    if (number % 4 == 1) handsets.back()->faults().Add(handset::HangUp(), Acknowledgement(3 + number));
    if (number % 4 == 2) handsets.back()->faults().Add(handset::Lose(), When::From(10 + number).Of("08"));
  }
  ASSERT_EQ(KRAL_VENTRIMS_Start(job_), 1) << Error().text;
  for (uint32_t number = 1; number < kHandsets; number += 4) {
    ASSERT_TRUE(Soon([&] { return handsets[number]->vanished(); }));
    handsets[number]->PlugIn();
    EXPECT_EQ(KRAL_VENTRIMS_Abort(job_, number + 1), 1);
  }
  ASSERT_EQ(KRAL_VENTRIMS_Wait(job_, 120000), 1);
  for (uint32_t number = 0; number < kHandsets; ++number) {
    const KRAL_VENTRIMS_RESULT result = Result(number);
    const uint32_t expected = number % 4 == 2 ? KRAL_VENTRIMS_ABORTED : KRAL_VENTRIMS_PASSED;
    EXPECT_EQ(result.progress.state, expected) << number << ": " << result.error.text;
    if (number % 4 == 1) {
      EXPECT_EQ(result.progress.attempts, 2u) << number;
    }
  }
}

}  // namespace
}  // namespace kral
