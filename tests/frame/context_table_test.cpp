// The handle table: rows, handles, sharing, release and its order, and the objects that rows own.
#include <cstdio>
#include <new>

#include "frame/diag_ftm.h"
#include "frame/phone_state.h"
#include "frame/resource_manager.h"
#include "kral/kral.h"
#include "tests/support/failing_allocation.h"
#include "tests/support/handset_ports.h"
#include "tests/support/scripted_server.h"
#include "tests/support/test.h"

namespace kral {
namespace {

namespace table = Kral_ResourceManager;

class ContextTable : public testing::Test {
 protected:
  ~ContextTable() override {
    table::SetMutexMaker({});
    KRAL_SetTargetType(0);
    KRAL_ClearPortAliasList();
  }
  static bool IsKnown(KRAL_HANDLE handle) {
    uint16_t port = 0;
    return KRAL_GetComPortNumber(handle, &port) == 1;
  }
  test::HandsetPorts ports_;
};

TEST_F(ContextTable, SamePortSharesARowUntilTheLastRelease) {
  ports_.Add(3);
  const KRAL_HANDLE handle = KRAL_ConnectServer(3);
  ASSERT_NE(handle, 0u);
  EXPECT_EQ(KRAL_ConnectServer(3), handle);
  KRAL_DisconnectServer(handle);
  EXPECT_TRUE(IsKnown(handle));
  EXPECT_EQ(KRAL_IsPhoneConnected(handle), 1) << "the row's next request opens the port again";
  KRAL_DisconnectServer(handle);
  EXPECT_FALSE(IsKnown(handle));
  EXPECT_FALSE(ports_.IsOpen(3));
}

TEST_F(ContextTable, FiftyFirstPortGivesZero) {
  std::vector<KRAL_HANDLE> handles;
  for (uint16_t port = 1000; port < 1050; ++port) {
    handles.push_back(table::CreateContext(port));
    ASSERT_NE(handles.back(), 0u);
  }
  EXPECT_EQ(KRAL_ConnectServer(1050), 0u);
  EXPECT_EQ(table::CreateContext(1007), handles[7]) << "a port that has its row already";
  table::ReleaseContext(handles[20], false);
  EXPECT_NE(table::CreateContext(1050), 0u);  // maybe the released value: Windows hands mutex handles out again
}

TEST_F(ContextTable, EachContextHasAMutexWhoseNameCountsUp) {
  std::vector<std::string> names;
  table::SetMutexMaker([&](const std::string& name) {
    names.push_back(name);
    return CreateNamedMutex(name);
  });
  for (int i = 0; i < 3; ++i) table::ReleaseContext(table::CreateContext(9), false);
  ASSERT_EQ(names.size(), 3u);
  const std::string prefix = "Kral_ResourceManager::CreateContext() - #";
  ASSERT_EQ(names[0].substr(0, prefix.size()), prefix);
  const int first = std::stoi(names[0].substr(prefix.size()));
  EXPECT_EQ(names[1], prefix + std::to_string(first + 1));
  EXPECT_EQ(names[2], prefix + std::to_string(first + 2));

  // One that cannot be created leaves no row.
  table::SetMutexMaker([](const std::string&) { return nullptr; });
  for (int i = 0; i < 60; ++i) EXPECT_EQ(KRAL_ConnectServer(9), 0u);
  table::SetMutexMaker({});
  EXPECT_NE(KRAL_ConnectServer(9), 0u);
}

TEST_F(ContextTable, DisconnectAllReleasesEveryConnectOfEveryPort) {
  ports_.Add(3);
  ports_.Add(4);
  const KRAL_HANDLE three = KRAL_ConnectServer(3);
  const KRAL_HANDLE four = KRAL_ConnectServer(4);
  EXPECT_EQ(KRAL_ConnectServer(3), three);
  KRAL_DisconnectAllServers();
  EXPECT_FALSE(IsKnown(three));
  EXPECT_FALSE(IsKnown(four));
  EXPECT_TRUE(ports_.open().empty());
}

TEST_F(ContextTable, TargetTypeAppliesToLaterPhoneObjectsAndTwoIsIgnored) {
  const KRAL_HANDLE modem = KRAL_ConnectServer(3);
  KRAL_SetTargetType(1);
  KRAL_SetTargetType(2);
  const KRAL_HANDLE application = KRAL_ConnectServer(4);
  EXPECT_EQ(table::GetPhone(modem)->target_type(), 0);
  EXPECT_EQ(table::GetPhone(application)->target_type(), 1);
}

TEST_F(ContextTable, DefaultReceiveModeIsRefusedBeyondOne) {
  EXPECT_EQ(KRAL_SetDefaultReceiveMode(2), 0);
  EXPECT_EQ(KRAL_SetDefaultReceiveMode(1), 1);
  EXPECT_EQ(table::default_receive_mode(), ReceiveMode::kWakeOnData);
  EXPECT_EQ(KRAL_SetDefaultReceiveMode(0), 1);
  const KRAL_HANDLE handle = KRAL_ConnectServer(3);
  EXPECT_EQ(KRAL_SetReceiveMode(handle, 1), 1);
  EXPECT_EQ(KRAL_SetReceiveMode(handle, 2), 0);
  EXPECT_EQ(KRAL_SetReceiveWait(handle, KRAL_LONGEST_RECEIVE_WAIT), 1);
  EXPECT_EQ(KRAL_SetReceiveWait(handle, KRAL_LONGEST_RECEIVE_WAIT + 1), 0);
  EXPECT_EQ(KRAL_NotifyReceived(handle), 0) << "a port tells by itself";
}

TEST_F(ContextTable, FirstAliasOfALogicalPortWins) {
  EXPECT_EQ(KRAL_ConnectServer_LogicalPort(1), 0u);
  EXPECT_EQ(KRAL_AddPortAliasEntry(1, 40), 1);
  EXPECT_EQ(KRAL_AddPortAliasEntry(1, 41), 1);
  EXPECT_EQ(KRAL_AddPortAliasEntry(2, 42), 1);
  uint16_t port = 0;
  EXPECT_EQ(KRAL_GetComPortNumber(KRAL_ConnectServer_LogicalPort(1), &port), 1);
  EXPECT_EQ(port, 40);
  EXPECT_EQ(KRAL_GetComPortNumber(KRAL_ConnectServer_LogicalPort(2), &port), 1);
  EXPECT_EQ(port, 42);
  EXPECT_EQ(KRAL_ConnectServer_LogicalPort(3), 0u);
  EXPECT_EQ(KRAL_ClearPortAliasList(), 1);
  EXPECT_EQ(KRAL_ConnectServer_LogicalPort(2), 0u);
}

TEST_F(ContextTable, VersionNamesTheLibraryMode) {
  for (const auto& [mode, name] : {std::pair{KRAL_LIBRARY_MODE_DIRECT, "VENTRIMS"},
                                   std::pair{KRAL_LIBRARY_MODE_SERVER, "ORBT"}, std::pair{2, "VENTRIMS"}}) {
    KRAL_SetLibraryMode(static_cast<uint8_t>(mode));
    char text[KRAL_LIBRARY_VERSION_SIZE];
    KRAL_GetLibraryVersion(text);
    unsigned major = 0;
    unsigned minor = 0;
    unsigned patch = 0;
    char mode_name[KRAL_LIBRARY_VERSION_SIZE];
    ASSERT_EQ(std::sscanf(text, "KRAL V%u.%u.%u,%31s", &major, &minor, &patch, mode_name), 4) << text;
    EXPECT_STREQ(mode_name, name);
    EXPECT_EQ(KRAL_GetLibraryVersionNumber(), (major << 16) + (minor << 8) + patch);
    EXPECT_EQ(KRAL_GetLibraryVersionNumber(), KRAL_VERSION_NUMBER);
  }
}

// --- Family objects -------------------------------------------------------------------------------------------------

class Noted : public FamilyObject {
 public:
  Noted(std::vector<std::string>& notes, std::string name) : notes_(notes), name_(std::move(name)) {}
  ~Noted() override { notes_.push_back(name_); }

 private:
  std::vector<std::string>& notes_;
  const std::string name_;
};

class Families : public ContextTable {
 protected:
  ~Families() override { KRAL_DisconnectAllServers(); }  // the objects write into the notes
  table::FamilyMaker Maker(std::string name) { return Maker(std::move(name), notes_); }
  table::FamilyMaker Maker(std::string name, std::vector<std::string>& notes) {
    return [this, name, &notes](Diag_FTM&, KRAL_HANDLE) {
      ++made_;
      return std::make_shared<Noted>(notes, name);
    };
  }
  std::vector<std::string> notes_;
  int made_ = 0;
};

TEST_F(Families, AreMadeOnceAndOnFirstUse) {
  const KRAL_HANDLE handle = KRAL_ConnectServer(3);
  EXPECT_EQ(table::GetFamilyObject(handle, FamilySlot::kGps, {}), nullptr) << "an empty maker only looks";
  const auto first = table::GetFamilyObject(handle, FamilySlot::kGps, Maker("gps"));
  ASSERT_NE(first, nullptr);
  EXPECT_EQ(table::GetFamilyObject(handle, FamilySlot::kGps, Maker("gps")), first);
  EXPECT_EQ(made_, 1);
  EXPECT_EQ(table::GetFamilyObject(0xDEADBEEF, FamilySlot::kGps, Maker("gps")), nullptr);
}

TEST_F(Families, FailedMakerLeavesTheSlotEmpty) {
  const KRAL_HANDLE handle = KRAL_ConnectServer(3);
  const auto throws = [](Diag_FTM&, KRAL_HANDLE) -> std::shared_ptr<FamilyObject> { throw std::runtime_error("no"); };
  EXPECT_EQ(table::GetFamilyObject(handle, FamilySlot::kKivrat, throws), nullptr);
  EXPECT_NE(table::GetFamilyObject(handle, FamilySlot::kKivrat, Maker("kivrat")), nullptr);
}

// A backup would leave out what is defined in one that it does not see.
TEST_F(Families, ALackOfMemoryDoesNotMakeThemLookMissing) {
  const KRAL_HANDLE handle = KRAL_ConnectServer(3);
  ASSERT_NE(table::GetFamilyObject(handle, FamilySlot::kGps, Maker("gps")), nullptr);
  size_t refused = 0;
  for (bool short_of_memory = true; short_of_memory;) {
    bool found = false;
    bool threw = false;
    const test::FailingAllocation failing(refused + 1);
    try {
      found = table::GetFamilyObject(handle, FamilySlot::kGps, {}) != nullptr;
    } catch (const std::bad_alloc&) {
      threw = true;
    }
    short_of_memory = failing.has_failed();
    if (short_of_memory) ++refused;
    EXPECT_TRUE(found || threw) << "allocation " << refused;
  }
  EXPECT_GT(refused, 0u);
}

TEST_F(Families, ServerModeSlotsStayEmptyInDirectMode) {
  const KRAL_HANDLE handle = KRAL_ConnectServer(3);
  EXPECT_EQ(table::GetFamilyObject(handle, FamilySlot::kEfs, Maker("efs")), nullptr);
  EXPECT_EQ(table::GetFamilyObject(handle, FamilySlot::kServerPort, Maker("port")), nullptr);
  EXPECT_EQ(table::GetSoftwareDownload(handle), nullptr);
  EXPECT_EQ(made_, 0);
}

TEST_F(Families, AreDestroyedInTheOrderOfRelease) {
  test::ScriptedServer server;
  const KRAL_HANDLE handle = KRAL_ConnectServer(3);
  const std::pair<FamilySlot, const char*> slots[] = {
      {FamilySlot::kServerPort, "server port"},
      {FamilySlot::kImageConversion, "image conversion"},
      {FamilySlot::kPelvor, "Pelvor"},
      {FamilySlot::kKivrat, "Kivrat"},
      {FamilySlot::kVentrims, "VENTRIMS"},
      {FamilySlot::kScratch, "scratch"},
      {FamilySlot::kNvManager, "NV manager"},
      {FamilySlot::kCalibrationData, "calibration data"},
      {FamilySlot::kEfs, "EFS"},
      {FamilySlot::kRfHal, "RF HAL"},
      {FamilySlot::kGnssSoc, "GNSS SOC"},
      {FamilySlot::kGps, "GPS"},
      {FamilySlot::kWlan, "WLAN"},
  };
  for (const auto& [slot, name] : slots) {
    ASSERT_NE(table::GetFamilyObject(handle, slot, Maker(name, server.calls)), nullptr) << name;
  }
  server.TakeCalls();
  table::ReleaseContext(handle, true);
  // The phone object's end shows by its listener, the proxy's by its own.
  EXPECT_EQ(server.TakeCalls(),
            (std::vector<std::string>{"WLAN", "GPS", "GNSS SOC", "RF HAL", "unregister", "end KRAL", "EFS",
                                      "calibration data", "NV manager", "scratch", "VENTRIMS", "Kivrat", "Pelvor",
                                      "image conversion", "server port"}));
}

TEST_F(Families, ObjectInUseOutlivesItsRow) {
  const KRAL_HANDLE handle = KRAL_ConnectServer(3);
  auto held = table::GetFamilyObject(handle, FamilySlot::kGps, Maker("gps"));
  table::ReleaseContext(handle, true);
  EXPECT_TRUE(notes_.empty());
  held.reset();
  EXPECT_EQ(notes_, (std::vector<std::string>{"gps"}));
}

TEST_F(ContextTable, RequestThatHoldsThePhoneObjectCannotReopenAReleasedPort) {
  ports_.Add(3);
  const KRAL_HANDLE handle = KRAL_ConnectServer(3);
  const auto phone = table::GetPhone(handle);
  KRAL_DisconnectServer(handle);
  EXPECT_FALSE(phone->IsPhoneConnected());
  EXPECT_FALSE(phone->OpenPort({}));
  EXPECT_FALSE(ports_.IsOpen(3));
}

TEST_F(ContextTable, ConnectsOfManyThreadsShareOneRowAndOnePhoneObject) {
  ports_.Add(3);
  std::vector<KRAL_HANDLE> handles(8);
  std::vector<Diag_FTM*> phones(8);
  std::vector<std::thread> threads;
  for (size_t i = 0; i < handles.size(); ++i) {
    threads.emplace_back([&, i] {
      handles[i] = KRAL_ConnectServer(3);
      phones[i] = table::GetPhone(handles[i]).get();
    });
  }
  for (auto& thread : threads) thread.join();
  EXPECT_EQ(handles, std::vector<KRAL_HANDLE>(8, handles[0]));
  EXPECT_EQ(phones, std::vector<Diag_FTM*>(8, phones[0]));
  for (size_t i = 0; i < handles.size(); ++i) KRAL_DisconnectServer(handles[0]);
  EXPECT_FALSE(IsKnown(handles[0]));
}

// --- What families keep for a phone ---------------------------------------------------------------------------------

template <int N>
struct Kept {
  int value = N;
};

template <int... N>
std::array<const void*, sizeof...(N)> AddressesOf(PhoneState& state) {
  return {&state.Get<Kept<N>>()...};
}

TEST(PhoneState, ThreadsThatAskAtOnceGetTheSameObjectOfEveryType) {
  for (int round = 0; round < 200; ++round) {
    PhoneState state;
    std::atomic<bool> go{false};
    std::vector<std::array<const void*, 4>> seen(4);
    std::vector<std::thread> threads;
    for (auto& addresses : seen) {
      threads.emplace_back([&] {
        while (!go) std::this_thread::yield();
        addresses = AddressesOf<1, 2, 3, 4>(state);
      });
    }
    go = true;
    for (std::thread& thread : threads) thread.join();
    for (const auto& addresses : seen) ASSERT_EQ(addresses, seen[0]);
    ASSERT_EQ((AddressesOf<1, 2, 3, 4>(state)), seen[0]);
    ASSERT_EQ(state.Get<Kept<3>>().value, 3);
  }
}

}  // namespace
}  // namespace kral
