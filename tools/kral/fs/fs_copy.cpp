// Plans a copy, then carries it out file by file. What stands in the way of one file does not stop the others; a
// handset that does not answer, and a file that arrives changed, do.
#include "tools/kral/fs/fs_copy.h"

#include <algorithm>
#include <cctype>
#include <set>
#include <utility>

#include "platform/console.h"
#include "platform/file_util.h"
#include "platform/folder.h"
#include "tools/kral/format.h"
#include "tools/kral/fs/fs_names.h"
#include "tools/kral/interrupt.h"
#include "tools/kral/safe_text.h"

namespace kral::tool {
namespace {

constexpr std::uint64_t kLargestFile = 256u << 20;  // more than handsets hold; what is compared is kept in memory

// Read once, for as many handsets as there are.
const Bytes& StandardInput() {
  static const Bytes all = [] {
    Bytes bytes;
    if (ReadStandardInput(kLargestFile, bytes)) return bytes;
    ThrowIfInterrupted();
    throw ToolError(ExitCode::kBadFile, "the standard input cannot be read whole",
                    Format("it may have {}", SizeText(kLargestFile)));
  }();
  return all;
}

Bytes ReadLocal(const std::string& path) {
  if (path == kStandardInput) return StandardInput();
  Bytes bytes;
  if (LookAt(path).kind == LocalKind::kOther) {
    throw ToolError(ExitCode::kBadFile, Format("{} is no ordinary file", path),
                    "write what comes from pipes and devices into a file first");
  }
  if (const auto error = ReadWholeFile(path, kLargestFile, bytes)) {
    throw ToolError(ExitCode::kBadFile, Format("{} cannot be read: {}", path, error.message()),
                    Format("check the name and its permissions; a file may have {}", SizeText(kLargestFile)));
  }
  return bytes;
}

void MakeLocalFolder(const std::string& path) {
  if (const auto error = MakeFolder(path)) {
    throw ToolError(ExitCode::kBadFile, Format("the folder {} cannot be made: {}", path, error.message()),
                    "check the name and the permissions of the folder around it");
  }
}

std::string LowerCase(std::string text) {
  std::ranges::transform(text, text.begin(),
                         [](unsigned char character) { return static_cast<char>(std::tolower(character)); });
  return text;
}

// "." and ".." name a folder by where it is.
bool IsName(std::string_view name) {
  return !name.empty() && name != "." && name != "..";
}

// Of either side: both join names with '/'.
bool IsIn(const std::string& folder, const std::string& path) {
  return path.starts_with(JoinPath(folder, ""));
}

ToolError UnsafeName(const std::string& where) {
  return {ExitCode::kSafetyStop, Format("the name of {} is not safe on the PC", where),
          "kral fs get :PATH NAME fetches one file under another name"};
}

ToolError NeedsRecursion(const std::string& where) {
  return {ExitCode::kUsage, Format("{} is a directory", where), "-r copies it with all that is in it"};
}

}  // namespace

Copier::Copier(Context& context, RemoteFiles& files, const CopyOptions& options, std::string work)
    : context_(context), files_(files), options_(options), progress_(context.out, std::move(work), 0) {
  files_.SetWatch([this](std::uint32_t done) { progress_.Update(base_ + done); });
}

Copier::~Copier() {
  files_.SetWatch({});
}

// --- From the handset -----------------------------------------------------------------------------------------------

void Copier::Get(const std::string& source, const std::string& target) {
  const auto status = files_.Status(source);
  auto to = target;
  const std::string name(LastEfsName(source));
  if (LookAt(target).kind == LocalKind::kFolder && IsName(name)) {
    if (!IsSafeLocalName(name)) throw UnsafeName(files_.Where(source));
    to = JoinPath(target, name);
  }
  if (status.is_directory() && !options_.recursive) throw NeedsRecursion(files_.Where(source));
  const auto plan = [&] {
    if (status.is_directory()) return PlanGet(source, to);
    AddJob(source, to, status.size, status.size);
  };
  Run(plan, MakeLocalFolder, [this](const Job& job) { return GetOne(job); });
}

// A handset may name its files as it likes: only names that stay inside the target are followed. The limit that
// paths have in requests ends every descent.
void Copier::PlanGet(const std::string& source, const std::string& target) {
  progress_.Describe(source);
  const auto entries = files_.List(source);
  folders_.push_back(target);
  std::set<std::string> taken;  // where the PC does not tell cases apart, the second one would replace the first
  for (const auto& entry : entries) {
    const auto from = JoinEfs(source, entry.name);
    if (entry.kind == RemoteEntry::Kind::kLink) {
      Leave(from, "links are not copied");
    } else if (entry.kind == RemoteEntry::Kind::kOther) {
      Leave(from, "it is neither file nor directory");
    } else if (!IsSafeLocalName(entry.name) || !taken.insert(LowerCase(entry.name)).second) {
      Fail(from, UnsafeName(files_.Where(from)));
    } else if (entry.kind == RemoteEntry::Kind::kDirectory) {
      Try(from, [&] { PlanGet(from, JoinPath(target, entry.name)); });
    } else {
      AddJob(from, JoinPath(target, entry.name), entry.size, entry.size);
    }
  }
}

const char* Copier::GetOne(const Job& job) {
  const auto there = LookAt(job.to);
  if (there.kind == LocalKind::kFolder) {
    throw ToolError(ExitCode::kBadFile, Format("{} is a folder", job.to), "name another file");
  }
  if (there.kind == LocalKind::kOther) {  // a device or a pipe, which a new file would replace
    throw ToolError(ExitCode::kBadFile, Format("{} is no ordinary file", job.to),
                    "name another file; kral fs cat prints a file");
  }
  const bool comparable = there.kind == LocalKind::kFile && there.size == job.size && job.size <= kLargestFile;
  if (options_.force || !comparable) {
    files_.ReadInto(job.to, job.from);
    return "copied";
  }
  const auto bytes = files_.ReadAll(job.from, job.size);
  if (bytes == ReadLocal(job.to)) return "equal";
  if (const auto error = ReplaceWholeFile(job.to, bytes)) {
    throw ToolError(ExitCode::kBadFile, Format("{} cannot be written: {}", job.to, error.message()),
                    "check the disk and the permissions");
  }
  return "copied";
}

// --- To the handset -------------------------------------------------------------------------------------------------

void Copier::Put(const std::vector<std::string>& sources, const std::string& target) {
  const auto there = files_.Find(target);
  const bool is_folder = there && there->is_directory();
  if (sources.size() > 1 && !is_folder) {
    throw ToolError(ExitCode::kUsage, Format("{} is no directory for {} files", files_.Where(target), sources.size()),
                    "kral fs mkdir makes it");
  }
  for (const auto& source : sources) {
    if (LookAt(source).kind == LocalKind::kFolder && !options_.recursive) throw NeedsRecursion(source);
  }
  const auto plan = [&] {
    for (const auto& source : sources) {
      const bool into = is_folder && source != kStandardInput && IsName(LastName(source));
      const auto to = into ? JoinEfs(target, LastName(source)) : target;
      auto local = LookAt(source);
      if (source == kStandardInput) local = {LocalKind::kFile, StandardInput().size()};
      if (local.kind == LocalKind::kFolder) {
        PlanPut(source, to);
      } else {
        AddJob(source, to, local.size, local.size * (options_.verify ? 2 : 1));
      }
    }
  };
  Run(
      plan, [this](const std::string& path) { files_.MakeDirectory(path); },
      [this](const Job& job) { return PutOne(job); });
}

void Copier::PlanPut(const std::string& source, const std::string& target) {
  std::vector<FolderEntry> entries;
  if (const auto error = ListFolder(source, entries)) {
    throw ToolError(ExitCode::kBadFile, Format("the folder {} cannot be read: {}", source, error.message()),
                    "check its permissions");
  }
  folders_.push_back(target);
  for (const auto& [name, file] : entries) {
    const auto from = JoinPath(source, name);
    const auto to = JoinEfs(target, name);
    if (file.kind == LocalKind::kFolder) {
      Try(from, [&] { PlanPut(from, to); });
    } else if (file.kind == LocalKind::kFile) {
      AddJob(from, to, file.size, file.size * (options_.verify ? 2 : 1));
    } else {
      Leave(from, "it is neither file nor folder");
    }
  }
}

const char* Copier::PutOne(const Job& job) {
  const auto bytes = ReadLocal(job.from);
  const auto before = files_.Find(job.to);
  if (before && before->is_directory()) {
    throw ToolError(ExitCode::kRefused, Format("{} is a directory", files_.Where(job.to)), "name another file");
  }
  // An item file stays one: the firmware that reads it would not find it otherwise.
  const bool as_item = options_.item || (before && before->is_item());
  if (!options_.force && before && before->size == bytes.size() && before->is_item() == as_item) {
    if (IsEqual(job.to, bytes)) return "equal";
    total_ += bytes.size();
    progress_.SetTotal(total_);
  }
  WriteTo(job.to, bytes, as_item);
  if (options_.verify) Verify(job, bytes);
  return "copied";
}

void Copier::WriteTo(const std::string& path, const Bytes& bytes, bool as_item) {
  if (as_item) {
    files_.WriteItem(path, bytes);
  } else {
    files_.Write(path, bytes);
  }
  base_ += bytes.size();
}

bool Copier::IsEqual(const std::string& path, const Bytes& bytes) {
  const bool equal = files_.ReadAll(path, static_cast<std::uint32_t>(bytes.size())) == bytes;
  base_ += bytes.size();
  return equal;
}

void Copier::Verify(const Job& job, const Bytes& bytes) {
  const auto size = files_.Status(job.to).size;
  auto difference = std::min<std::size_t>(size, bytes.size());
  if (size == bytes.size()) {
    const auto back = files_.ReadAll(job.to, size);
    const auto first = std::mismatch(bytes.begin(), bytes.end(), back.begin(), back.end()).first;
    if (first == bytes.end() && back.size() == bytes.size()) return;
    difference = static_cast<std::size_t>(first - bytes.begin());
  }
  context_.found["mismatch"] = {{"from", job.from}, {"to", job.to}, {"offset", difference}};
  throw ToolError(ExitCode::kMismatch,
                  Format("{} differs from {} at offset {}", files_.Where(job.to), job.from, difference),
                  "put it again; a handset that keeps changing bytes has worn memory");
}

// --- Both ways ------------------------------------------------------------------------------------------------------

void Copier::AddJob(std::string from, std::string to, std::uint64_t size, std::uint64_t moved) {
  const auto shown = static_cast<std::uint32_t>(std::min<std::uint64_t>(size, UINT32_MAX));
  jobs_.push_back({std::move(from), std::move(to), shown, moved});
  total_ += moved;
  progress_.SetTotal(total_);
}

// What fails for one file or folder only is noted, and no reason to stop.
template <class Step>
bool Copier::Try(const std::string& path, Step&& step) {
  try {
    step();
    return true;
  } catch (const ToolError& error) {
    if (!ConcernsOneFile(error)) throw;
    Fail(path, error);
    return false;
  }
}

void Copier::Drop(const std::string& folder) {
  std::erase_if(jobs_, [&](const Job& job) {
    if (!IsIn(folder, job.to)) return false;
    total_ -= job.moved;
    return true;
  });
  progress_.SetTotal(total_);
}

template <class MakeOne>
void Copier::MakeFolders(MakeOne&& make) {
  std::optional<std::string> missing;
  for (const auto& folder : folders_) {
    if (missing && IsIn(*missing, folder)) continue;
    if (Try(folder, [&] { make(folder); })) continue;
    missing = folder;
    Drop(folder);
  }
}

template <class CopyOne>
void Copier::CopyFiles(CopyOne&& copy) {
  const bool alone = jobs_.size() == 1 && failed_ == 0;
  for (const auto& job : jobs_) {
    progress_.Describe(job.from);
    const auto ahead = total_ - base_ - job.moved;  // the bytes of the files behind this one
    const auto copy_one = [&] {
      const std::string_view result = copy(job);
      const bool equal = result == "equal";
      ++(equal ? equal_ : copied_);
      if (!equal) bytes_ += job.size;
      rows_.push_back({{"from", job.from}, {"to", job.to}, {"bytes", job.size}, {"result", result}});
    };
    if (alone) {
      copy_one();
    } else {
      Try(job.from, copy_one);
    }
    base_ = total_ - ahead;
    progress_.Update(base_);
  }
}

template <class Plan, class MakeOne, class CopyOne>
void Copier::Run(Plan&& plan, MakeOne&& make_folder, CopyOne&& copy) {
  try {
    plan();
    MakeFolders(make_folder);
    CopyFiles(copy);
  } catch (...) {
    context_.found.update(Members());
    throw;
  }
  Report();
}

void Copier::Leave(std::string_view path, std::string_view reason) {
  progress_.Note(Format("{} is left out: {}", NameText(path), reason));
  left_.push_back({{"path", path}, {"reason", reason}});
}

void Copier::Fail(std::string_view path, const ToolError& error) {
  progress_.Note(error.what());
  left_.push_back({{"path", path}, {"reason", error.what()}});
  ++failed_;
  if (!first_failure_) first_failure_ = error;
}

Json Copier::Members() const {
  Json members{{"port", files_.session().port()}, {"copied", copied_}, {"equal", equal_}, {"bytes", bytes_}};
  members["files"] = rows_;
  members["left_out"] = left_;
  return members;
}

void Copier::Report() const {
  if (failed_ > 0) {
    context_.found.update(Members());
    const auto more = failed_ > 1 ? Format(", and {} more", failed_ - 1) : std::string();
    throw ToolError(first_failure_->code(), first_failure_->what() + more, first_failure_->hint(),
                    first_failure_->record());
  }
  auto members = Members();
  if (options_.verify) members["verified"] = true;
  context_.out.Result(members, Format("{} copied, {} equal already, {}\n", copied_, equal_, SizeText(bytes_)));
}

}  // namespace kral::tool
