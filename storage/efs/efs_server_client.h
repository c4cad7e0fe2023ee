// The EFS object of a context in server mode: hands whole jobs on the handset's files to the phone server.
#ifndef KRAL_STORAGE_EFS_EFS_SERVER_CLIENT_H
#define KRAL_STORAGE_EFS_EFS_SERVER_CLIENT_H

#include <functional>
#include <memory>
#include <string>

#include "frame/efs_server.h"
#include "frame/resource_manager.h"
#include "kral/types.h"

namespace kral {

class DataLogFileHandler;
class Diag_FTM;

namespace efs {

class EFS final : public FamilyObject {
 public:
  bool EfsRmDir(DataLogFileHandler& log, uint16_t port, const std::string& folder);
  bool CreateCEFS(DataLogFileHandler& log, uint16_t port, EfsImageJob job, const std::string& image_file);

 private:
  bool Initialize(DataLogFileHandler& log, uint16_t port);
  bool Connect(DataLogFileHandler& log, uint16_t port);
  // After a failure that may be a server's that is gone: the next job connects afresh.
  void Forget();
  // Runs a job on the module while the phone is locked. `failure` is logged when the job fails.
  bool EfsStarter(DataLogFileHandler& log, uint16_t port, const char* failure,
                  const std::function<bool(EfsModule&)>& job);

  std::unique_ptr<EfsServer> server_;
  std::unique_ptr<EfsServerPhone> phone_;
  std::unique_ptr<EfsModule> module_;
};

// Null arguments are empty names. 0 in direct mode, where there is no server.
bool RemoveTree(Diag_FTM& phone, const char* folder);
bool RunImageJob(Diag_FTM& phone, EfsImageJob job, const char* image_file);

}  // namespace efs
}  // namespace kral

#endif
