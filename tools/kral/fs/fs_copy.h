// Copies files between the PC and the handset, one or whole folders, and sees to it that they arrived.
#ifndef KRAL_TOOLS_FS_FS_COPY_H
#define KRAL_TOOLS_FS_FS_COPY_H

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tools/kral/fs/fs_remote.h"
#include "tools/kral/progress.h"
#include "tools/kral/verbs.h"

namespace kral::tool {

struct CopyOptions {
  bool recursive = false;
  bool verify = false;  // read back and compare what was put
  bool force = false;   // copy files that are equal already, too
  bool item = false;    // put as item files
};

inline constexpr const char* kStandardInput = "-";  // in place of a local file to put

// For one Get or Put. A target that is a folder takes the source in under its name; anything else is the new name.
class Copier {
 public:
  Copier(Context& context, RemoteFiles& files, const CopyOptions& options, std::string work);
  ~Copier();
  Copier(const Copier&) = delete;
  Copier& operator=(const Copier&) = delete;

  void Get(const std::string& source, const std::string& target);
  void Put(const std::vector<std::string>& sources, const std::string& target);  // several: only into a directory

 private:
  struct Job {
    std::string from;
    std::string to;
    std::uint32_t size;
    std::uint64_t moved;  // bytes on the line, the reading back included
  };

  void PlanGet(const std::string& source, const std::string& target);
  void PlanPut(const std::string& source, const std::string& target);
  void AddJob(std::string from, std::string to, std::uint64_t size, std::uint64_t moved);
  template <class Plan, class MakeOne, class CopyOne>
  void Run(Plan&& plan, MakeOne&& make_folder, CopyOne&& copy);
  template <class MakeOne>
  void MakeFolders(MakeOne&& make);
  template <class CopyOne>
  void CopyFiles(CopyOne&& copy);
  template <class Step>
  bool Try(const std::string& path, Step&& step);  // false when it failed for this path only
  void Drop(const std::string& folder);            // the jobs in a folder that could not be made
  const char* GetOne(const Job& job);              // the result: "copied" or "equal"
  const char* PutOne(const Job& job);

  bool IsEqual(const std::string& path, const Bytes& bytes);
  void Verify(const Job& job, const Bytes& bytes);
  void WriteTo(const std::string& path, const Bytes& bytes, bool as_item);

  void Leave(std::string_view path, std::string_view reason);  // what is not copied, on purpose
  void Fail(std::string_view path, const ToolError& error);    // what could not be copied
  Json Members() const;
  void Report() const;

  Context& context_;
  RemoteFiles& files_;
  const CopyOptions options_;
  Progress progress_;
  std::vector<std::string> folders_;  // to be made, outer ones first
  std::vector<Job> jobs_;
  std::uint64_t total_ = 0;  // bytes to be moved, the reading back included
  std::uint64_t base_ = 0;   // of them, what was moved before the transfer under way

  Json rows_ = Json::array();
  Json left_ = Json::array();
  std::uint64_t bytes_ = 0;  // of the files copied
  std::size_t copied_ = 0;
  std::size_t equal_ = 0;
  std::size_t failed_ = 0;
  std::optional<ToolError> first_failure_;
};

}  // namespace kral::tool

#endif
