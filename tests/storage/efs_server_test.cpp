// Jobs that the phone server does: which of its methods are called, and what is logged when one of them fails.
#include "kral/efs.h"
#include "kral/pkv.h"
#include "kral/text_log.h"
#include "tests/support/phone_log.h"
#include "tests/support/scripted_server.h"
#include "tests/support/test.h"

namespace kral {
namespace {

// A server that fails, or throws, in the method named.
struct Script {
  std::string fails;
  std::string throws;
  std::vector<std::string> calls;

  bool Call(const std::string& method, const std::string& argument = {}) {
    calls.push_back(argument.empty() ? method : method + " " + argument);
    if (method == throws) throw OrbtServerException();
    return method != fails;
  }
};

class Module final : public EfsModule {
 public:
  explicit Module(Script& script) : script_(script) {}
  bool RemoveTree(const std::string& folder) override { return script_.Call("remove", folder); }
  bool EFS2CreatePhoneImage(EfsImageJob job, const std::string& image_file) override {
    return script_.Call("image", std::to_string(static_cast<int>(job)) + " " + image_file);
  }

 private:
  Script& script_;
};

class Phone final : public EfsServerPhone {
 public:
  explicit Phone(Script& script) : script_(script) {}
  std::unique_ptr<EfsModule> MakeEfsModule() override {
    return script_.Call("module") ? std::make_unique<Module>(script_) : nullptr;
  }
  bool LockPhone() override { return script_.Call("lock"); }
  void UnlockPhone() override { script_.Call("unlock"); }

 private:
  Script& script_;
};

class Server final : public EfsServer {
 public:
  explicit Server(Script& script) : script_(script) {}
  bool ConnectToPort(uint16_t port) override { return script_.Call("connect", std::to_string(port)); }
  std::unique_ptr<EfsServerPhone> GetPhone(uint16_t) override {
    return script_.Call("phone") ? std::make_unique<Phone>(script_) : nullptr;
  }

 private:
  Script& script_;
};

class EfsServerJobs : public testing::Test {
 protected:
  EfsServerJobs() {
    ServerFactory factory = CurrentServerFactory();
    factory.make_efs_server = [this](const char*) -> std::unique_ptr<EfsServer> {
      return script_.Call("server") ? std::make_unique<Server>(script_) : nullptr;
    };
    SetServerFactory(std::move(factory));
  }

  // The error lines of a job on a connection of its own.
  std::string Errors(const std::function<uint8_t(KRAL_HANDLE)>& job, uint8_t expected) {
    const KRAL_HANDLE handle = KRAL_ConnectServer(3);
    std::string text;
    {
      test::PhoneLog log(handle);
      EXPECT_EQ(job(handle), expected);
      for (const std::string& line : log.lines()) {
        if (line.starts_with("16 ")) text += line.substr(3) + "|";
      }
    }
    KRAL_DisconnectServer(handle);
    return text;
  }
  std::string Calls() {
    std::string text;
    for (const std::string& call : std::exchange(script_.calls, {})) text += call + "|";
    return text;
  }

  test::ScriptedServer server_;
  Script script_;
};

uint8_t RemoveTree(KRAL_HANDLE handle) {
  return KRAL_EfsRmTree(handle, "/a");
}

TEST_F(EfsServerJobs, AreDoneOnTheLockedPhone) {
  EXPECT_EQ(Errors(RemoveTree, 1), "");
  EXPECT_EQ(Calls(), "server|connect 3|phone|module|lock|remove /a|unlock|");
  const std::pair<uint8_t(KRAL_CALL*)(KRAL_HANDLE, const char*), EfsImageJob> jobs[] = {
      {KRAL_BackupCEFS_Legacy, EfsImageJob::kBackupLegacy},
      {KRAL_BackupCEFS_Alternate, EfsImageJob::kBackupAlternate},
      {KRAL_UploadCEFS_File, EfsImageJob::kUploadFile},
      {KRAL_UploadCEFS_File2, EfsImageJob::kUploadFile2},
      {KRAL_UploadCEFS_ImageAlternate, EfsImageJob::kUploadImageAlternate},
      {KRAL_DownloadCEFS_File, EfsImageJob::kDownloadFile}};
  for (const auto& [function, job] : jobs) {
    const auto call = function;
    EXPECT_EQ(Errors([call](KRAL_HANDLE handle) { return call(handle, "image"); }, 1), "");
    EXPECT_EQ(Calls(),
              "server|connect 3|phone|module|lock|image " + std::to_string(static_cast<int>(job)) + " image|unlock|");
  }
  Errors([](KRAL_HANDLE handle) { return RemoveTree(handle) & RemoveTree(handle); }, 1);
  EXPECT_EQ(Calls(), "server|connect 3|phone|module|lock|remove /a|unlock|lock|remove /a|unlock|")
      << "the connection to the server is kept";
}

TEST_F(EfsServerJobs, FailuresAreNamedAndThePhoneIsUnlocked) {
  const std::string none = "EFS::EfsStarter - Not connected to Server|";
  const struct {
    const char* fails;
    const char* throws;
    std::string errors;
  } rows[] = {
      {"server", "", "EFS::initialize - Failed to connect to the ORBT Server|" + none},
      {"connect", "", "EFS::initialize - ConnectToPort failed.|" + none},
      {"phone", "", "EFS::initialize - GetPhonePtr() Error.|" + none},
      {"module", "", "EFS::initialize - EFS Module Create Error.|" + none},
      {"lock", "", "EFS::EfsStarter - LockPhone() failed|"},
      {"remove", "", "EFS::EfsRmDir - pMirelEfs->RemoveTree() failed|"},
      {"", "connect", "EFS::initialize - COM exception thrown. |" + none},
      {"", "remove", "EFS::EfsStarter - COM exception thrown. |"},
      {"", "unlock", ""},
  };
  for (const auto& row : rows) {
    SCOPED_TRACE(std::string(row.fails) + row.throws);
    script_.fails = row.fails;
    script_.throws = row.throws;
    EXPECT_EQ(Errors(RemoveTree, row.errors.empty()), row.errors);
    const std::string calls = Calls();
    const bool locked = calls.find("lock|remove") != std::string::npos;
    EXPECT_EQ(calls.ends_with("unlock|"), locked);
  }
  // A server that went away is connected to afresh by the next job.
  script_ = {.fails = {}, .throws = "lock", .calls = {}};
  Errors(
      [&](KRAL_HANDLE handle) {
        RemoveTree(handle);
        Calls();
        script_.throws.clear();
        return RemoveTree(handle);
      },
      1);
  EXPECT_EQ(Calls(), "server|connect 3|phone|module|lock|remove /a|unlock|");
  script_ = {.fails = "image", .throws = {}, .calls = {}};
  EXPECT_EQ(Errors([](KRAL_HANDLE handle) { return KRAL_DownloadCEFS_File(handle, "image"); }, 0),
            "EFS::CreateCEFS - pMirelEfs->EFS2CreatePhoneImage() failed|EfsStarter() failed during CreateCEFS_impl|");
}

TEST_F(EfsServerJobs, DirectModeHasNoServer) {
  KRAL_SetLibraryMode(0);
  EXPECT_EQ(Errors(RemoveTree, 0), "EFS::EfsStarter - Not connected to Server|");
  EXPECT_EQ(Errors([](KRAL_HANDLE handle) { return KRAL_UploadPkvFile(handle, "a.pkv", 0); }, 0),
            "KRAL_UploadPkvFile() - no phone server|");
  EXPECT_EQ(Calls(), "");
}

TEST(PkvServer, JobsGoToItsDownloadAgent) {
  static std::vector<std::string> calls;
  calls.clear();
  class Agent : public SoftwareDownload {
   public:
    bool UploadPkvFile(const std::string& file, uint32_t options) override { return Note("up " + file, options); }
    bool DownloadPkvFile(const std::string& file, uint32_t options) override { return Note("down " + file, options); }

   private:
    static bool Note(const std::string& call, uint32_t options) {
      calls.push_back(call + " " + std::to_string(options));
      if (options == 99) throw OrbtServerException();
      return options != 98;
    }
  };
  test::ScriptedServer server;
  ServerFactory factory = CurrentServerFactory();
  factory.make_software_download = [](const char*, OrbtServer&) { return std::make_unique<Agent>(); };
  SetServerFactory(factory);
  const KRAL_HANDLE handle = KRAL_ConnectServer(7);
  EXPECT_EQ(KRAL_UploadPkvFile(handle, "a.pkv", 5), 1);
  EXPECT_EQ(KRAL_DownloadPkvFile(handle, nullptr, 98), 0);
  EXPECT_EQ(KRAL_DownloadPkvFile(handle, "b.pkv", 99), 0);
  EXPECT_EQ(calls, (std::vector<std::string>{"up a.pkv 5", "down  98", "down b.pkv 99"}));
}

}  // namespace
}  // namespace kral
