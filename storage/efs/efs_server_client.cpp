// Jobs that the phone server does: removing trees and file-system images. In direct mode they are refused.
#include "storage/efs/efs_server_client.h"

#include "base/at_exit.h"
#include "base/failure.h"
#include "frame/diag_ftm.h"
#include "frame/orbt_server.h"
#include "platform/forced_unwind.h"

namespace kral::efs {

bool EFS::Connect(DataLogFileHandler& log, uint16_t port) {
  const ServerFactory factory = CurrentServerFactory();
  if (factory.make_efs_server) server_ = factory.make_efs_server("KRAL-EFS");
  if (!server_) {
    log.WriteLine(kLogErr, "EFS::initialize - Failed to connect to the ORBT Server");
  } else if (!server_->ConnectToPort(port)) {
    log.WriteLine(kLogErr, "EFS::initialize - ConnectToPort failed.");
  } else if (phone_ = server_->GetPhone(port); !phone_) {
    log.WriteLine(kLogErr, "EFS::initialize - GetPhonePtr() Error.");
  } else if (module_ = phone_->MakeEfsModule(); !module_) {
    log.WriteLine(kLogErr, "EFS::initialize - EFS Module Create Error.");
  }
  return module_ != nullptr;
}

bool EFS::Initialize(DataLogFileHandler& log, uint16_t port) {
  if (module_) return true;
  try {
    if (Connect(log, port)) return true;
  } catch (const OrbtServerException&) {
    log.WriteLine(kLogErr, "EFS::initialize - COM exception thrown. ");
  } catch (...) {
    PassForcedUnwind();
    log.WriteLine(kLogErr, "EFS::initialize - Unknown exception thrown.");
  }
  Forget();
  return false;
}

void EFS::Forget() {
  module_.reset();
  phone_.reset();
  server_.reset();
}

bool EFS::EfsStarter(DataLogFileHandler& log, uint16_t port, const char* failure,
                     const std::function<bool(EfsModule&)>& job) {
  if (!Initialize(log, port)) {
    log.WriteLine(kLogErr, "EFS::EfsStarter - Not connected to Server");
    return false;
  }
  try {
    if (!phone_->LockPhone()) {
      log.WriteLine(kLogErr, "EFS::EfsStarter - LockPhone() failed");
      return false;
    }
    const AtExit unlock([&phone = *phone_] {
      try {
        phone.UnlockPhone();
      } catch (...) {
        // The job's own result stands.
      }
    });
    if (job(*module_)) return true;
    log.WriteLine(kLogErr, "%s", failure);
  } catch (const OrbtServerException&) {
    log.WriteLine(kLogErr, "EFS::EfsStarter - COM exception thrown. ");
    Forget();
  } catch (...) {
    PassForcedUnwind();
    log.WriteLine(kLogErr, "EFS::EfsStarter - Unknown exception thrown.");
    Forget();
  }
  return false;
}

bool EFS::EfsRmDir(DataLogFileHandler& log, uint16_t port, const std::string& folder) {
  return EfsStarter(log, port, "EFS::EfsRmDir - pMirelEfs->RemoveTree() failed",
                    [&](EfsModule& module) { return module.RemoveTree(folder); });
}

bool EFS::CreateCEFS(DataLogFileHandler& log, uint16_t port, EfsImageJob job, const std::string& image_file) {
  if (EfsStarter(log, port, "EFS::CreateCEFS - pMirelEfs->EFS2CreatePhoneImage() failed",
                 [&](EfsModule& module) { return module.EFS2CreatePhoneImage(job, image_file); })) {
    return true;
  }
  log.WriteLine(kLogErr, "EfsStarter() failed during CreateCEFS_impl");
  return false;
}

namespace {

template <class Job>
bool OnServer(Diag_FTM& phone, const Job& job) {
  const auto efs = Kral_ResourceManager::GetFamily<EFS>(phone.handle(), FamilySlot::kEfs,
                                                        [](Diag_FTM&, KRAL_HANDLE) { return std::make_shared<EFS>(); });
  if (efs) return job(*efs) || Fail(Failure(KRAL_ERROR_REFUSED, "the phone server did not carry the job out"));
  phone.log().WriteLine(kLogErr, "EFS::EfsStarter - Not connected to Server");
  return Fail(Failure(KRAL_ERROR_ARGUMENT, "only a phone server can do this, and the connection has none"));
}

std::string Text(const char* text) {
  return text == nullptr ? std::string() : std::string(text);
}

}  // namespace

bool RemoveTree(Diag_FTM& phone, const char* folder) {
  return OnServer(phone, [&](EFS& efs) { return efs.EfsRmDir(phone.log(), phone.port(), Text(folder)); });
}

bool RunImageJob(Diag_FTM& phone, EfsImageJob job, const char* image_file) {
  return OnServer(phone, [&](EFS& efs) { return efs.CreateCEFS(phone.log(), phone.port(), job, Text(image_file)); });
}

}  // namespace kral::efs
