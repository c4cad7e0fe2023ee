// kral fs: the handset's files. Looking and changing names is done here; copying is fs_copy's.
#include <algorithm>
#include <functional>
#include <memory>
#include <set>
#include <utility>

#include "platform/console.h"
#include "platform/folder.h"
#include "tools/kral/format.h"
#include "tools/kral/fs/fs_copy.h"
#include "tools/kral/fs/fs_names.h"
#include "tools/kral/fs/fs_remote.h"
#include "tools/kral/safe_text.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

constexpr std::uint32_t kLargestCat = 64u << 20;
constexpr std::uint32_t kDefaultSyncMs = 10000;
constexpr std::uint32_t kLongestSyncMs = 3600 * 1000;
constexpr std::uint16_t kSmallestPacket = 21;
constexpr std::uint16_t kLargestPacket = 4091;

struct FsOptions {
  std::vector<std::string> paths;
  CopyOptions copy;
  bool unverified = false;
  bool parents = false;
  std::uint32_t wait_ms = kDefaultSyncMs;
  std::uint16_t packet_size = 0;  // 0: as large as the handset takes
};

std::string First(const FsOptions& options) {
  return EfsPath(options.paths.empty() ? "/" : options.paths.front());
}

const char* NameOf(RemoteEntry::Kind kind) {
  switch (kind) {
    case RemoteEntry::Kind::kFile:
      return "file";
    case RemoteEntry::Kind::kDirectory:
      return "directory";
    case RemoteEntry::Kind::kLink:
      return "link";
    default:
      return "other";
  }
}

const char* KindName(const RemoteStatus& status) {
  return status.is_item() ? "item" : NameOf(status.kind());
}

Json Describe(const RemoteEntry& entry) {
  const bool is_item = (entry.mode & KRAL_EFS_MODE_KIND) == KRAL_EFS_MODE_ITEM_FILE;
  return {{"name", entry.name},
          {"type", is_item ? "item" : NameOf(entry.kind)},
          {"mode", Format("{:o}", entry.mode)},
          {"size", entry.size},
          {"modified", entry.modified}};
}

std::string ListLine(const RemoteEntry& entry) {
  const bool is_directory = entry.kind == RemoteEntry::Kind::kDirectory;
  return Format("{}  {:>10}  {}  {}{}\n", ModeText(entry.mode), entry.size, TimeText(entry.modified),
                NameText(entry.name), is_directory ? "/" : "");
}

// --- Looking --------------------------------------------------------------------------------------------------------

void List(Context& context, RemoteFiles& files, const FsOptions& options) {
  const auto path = First(options);
  std::vector<RemoteEntry> entries;
  if (const auto status = files.Status(path); status.is_directory()) {
    entries = files.List(path);
  } else {
    entries.push_back({status.kind(), std::string(LastEfsName(path)), status.mode, status.size, status.modified});
  }
  Json rows = Json::array();
  std::string text;
  for (const auto& entry : entries) {
    rows.push_back(Describe(entry));
    text += ListLine(entry);
  }
  context.out.Result({{"port", files.session().port()}, {"path", path}, {"entries", rows}}, text);
}

// Draws what is in a directory below its own line; links are shown and not followed, nor are names that would lead
// elsewhere. A directory that cannot be listed is marked.
Json Draw(RemoteFiles& files, const std::string& path, const std::string& indent, std::string& text) {
  Json rows = Json::array();
  const auto entries = files.List(path);
  for (std::size_t i = 0; i < entries.size(); ++i) {
    const auto& entry = entries[i];
    const bool last = i + 1 == entries.size();
    const bool is_directory = entry.kind == RemoteEntry::Kind::kDirectory;
    text += Format("{}{}{}{}\n", indent, last ? "`-- " : "|-- ", NameText(entry.name), is_directory ? "/" : "");
    rows.push_back(Describe(entry));
    if (!is_directory || entry.name.find('/') != std::string::npos) continue;
    const auto inner = indent + (last ? "    " : "|   ");
    try {
      rows.back()["entries"] = Draw(files, JoinEfs(path, entry.name), inner, text);
    } catch (const ToolError& error) {
      if (!ConcernsOneFile(error)) throw;
      rows.back()["error"] = error.what();
      text += Format("{}`-- [{}]\n", inner, error.what());
    }
  }
  return rows;
}

void Tree(Context& context, RemoteFiles& files, const FsOptions& options) {
  const auto path = First(options);
  auto text = NameText(path) + "\n";
  const auto rows = Draw(files, path, "", text);
  context.out.Result({{"port", files.session().port()}, {"path", path}, {"entries", rows}}, text);
}

void Cat(Context& context, RemoteFiles& files, const FsOptions& options) {
  const auto path = First(options);
  const auto status = files.Status(path);
  if (status.is_directory()) {
    throw ToolError(ExitCode::kUsage, Format("{} is a directory", files.Where(path)), "kral fs ls lists it");
  }
  if (status.size > kLargestCat) {
    throw ToolError(ExitCode::kUsage, Format("{} has {}", files.Where(path), SizeText(status.size)),
                    "kral fs get fetches files of any size");
  }
  const auto bytes = files.ReadAll(path, status.size);
  const Json members{{"port", files.session().port()}, {"path", path}, {"size", bytes.size()}};
  if (context.out.json()) {
    auto with_data = members;
    with_data["data"] = HexText(bytes);
    context.out.Result(with_data, "");
    return;
  }
  UseBinaryOutput();
  context.out.Result(members, {reinterpret_cast<const char*>(bytes.data()), bytes.size()});
}

void Stat(Context& context, RemoteFiles& files, const FsOptions& options) {
  const auto path = First(options);
  const auto status = files.Status(path);
  const Json members{{"port", files.session().port()},
                     {"path", path},
                     {"type", KindName(status)},
                     {"mode", Format("{:o}", status.mode)},
                     {"size", status.size},
                     {"links", status.links},
                     {"accessed", status.accessed},
                     {"modified", status.modified},
                     {"changed", status.changed}};
  context.out.Result(
      members, Format("{}\n  type      {}\n  mode      {} ({:o})\n  size      {}\n  links     {}\n"
                      "  accessed  {}\n  modified  {}\n  changed   {}\n",
                      NameText(path), KindName(status), ModeText(status.mode), status.mode, status.size, status.links,
                      TimeText(status.accessed), TimeText(status.modified), TimeText(status.changed)));
}

void Room(Context& context, RemoteFiles& files, const FsOptions& options) {
  const auto path = First(options);
  KRAL_EFS_STATFS status{};
  files.Ask(Format("the room of {}", NameText(path)), path, "KRAL_EFS2_DIAG_STATFS", [&](std::uint32_t* error) {
    return KRAL_EFS2_DIAG_STATFS(files.session().handle(), path.c_str(), error, &status);
  });
  const auto bytes = [&status](std::uint32_t blocks) { return std::uint64_t{blocks} * status.block_size; };
  const auto used = bytes(status.total_blocks - std::min(status.free_blocks, status.total_blocks));
  const Json members{{"port", files.session().port()},
                     {"path", path},
                     {"total", bytes(status.total_blocks)},
                     {"used", used},
                     {"available", bytes(status.available_blocks)},
                     {"block_size", status.block_size},
                     {"files", status.file_count},
                     {"most_files", status.max_file_count}};
  context.out.Result(
      members,
      Format("{} in all, {} used, {} available; {} of at most {} files\n", SizeText(bytes(status.total_blocks)),
             SizeText(used), SizeText(bytes(status.available_blocks)), status.file_count, status.max_file_count));
}

// --- Changing -------------------------------------------------------------------------------------------------------

using PathCall = std::uint8_t(KRAL_CALL*)(KRAL_HANDLE handle, const char* path, std::uint32_t* error_number);

// What is done path by path. A path that fails does not stop the others; what was done is told in any case.
class PathByPath {
 public:
  PathByPath(Context& context, RemoteFiles& files) : context_(context) {
    context_.found = {{"port", files.session().port()}, {"done", Json::array()}};
  }

  // False when it failed for this path only.
  bool Try(const std::function<void()>& step) {
    try {
      step();
      return true;
    } catch (const ToolError& error) {
      if (!ConcernsOneFile(error)) throw;
      if (failed_++ == 0) {
        first_ = error;
      } else {
        context_.out.Note(error.what());
      }
      return false;
    }
  }
  bool Do(const std::string& path, const std::function<void()>& change) {
    if (!Try(change)) return false;
    context_.found["done"].push_back(path);
    return true;
  }

  void Conclude() const {
    if (!first_) return context_.out.Result(context_.found, "");
    const auto more = failed_ > 1 ? Format(", and {} more", failed_ - 1) : std::string();
    throw ToolError(first_->code(), first_->what() + more, first_->hint(), first_->record());
  }

 private:
  Context& context_;
  std::optional<ToolError> first_;
  std::size_t failed_ = 0;
};

void ForEachPath(Context& context, RemoteFiles& files, const FsOptions& options,
                 const std::function<void(const std::string& path)>& change) {
  PathByPath work(context, files);
  for (const auto& argument : options.paths) {
    const auto path = EfsPath(argument);
    work.Do(path, [&] { change(path); });
  }
  work.Conclude();
}

void Remove(RemoteFiles& files, const std::string& path, std::string_view function, PathCall call) {
  files.Ask(Format("the removal of {}", NameText(path)), path, function,
            [&](std::uint32_t* error) { return call(files.session().handle(), path.c_str(), error); });
}

void RemoveFile(RemoteFiles& files, const std::string& path) {
  Remove(files, path, "KRAL_EfsDelete", KRAL_EfsDelete);
}

void RemoveDirectory(RemoteFiles& files, const std::string& path) {
  Remove(files, path, "KRAL_EfsRmDir", KRAL_EfsRmDir);
}

// With all that is in it, links as such. Names that would lead elsewhere are left alone, and their directory stays.
bool RemoveTree(PathByPath& work, RemoteFiles& files, const std::string& path) {
  bool whole = true;
  std::vector<RemoteEntry> entries;
  if (!work.Try([&] { entries = files.List(path); })) return false;
  for (const auto& entry : entries) {
    const auto inner = JoinEfs(path, entry.name);
    bool removed = false;
    if (entry.name.find('/') != std::string::npos) {
      work.Try([&] {
        throw ToolError(ExitCode::kSafetyStop, Format("the name of {} leads elsewhere", files.Where(inner)),
                        "kral fs rm removes it by its whole path");
      });
    } else if (entry.kind == RemoteEntry::Kind::kDirectory) {
      removed = RemoveTree(work, files, inner);
    } else {
      removed = work.Do(inner, [&] { RemoveFile(files, inner); });
    }
    whole = whole && removed;
  }
  return whole && work.Do(path, [&] { RemoveDirectory(files, path); });
}

// A status would follow a link to a directory, whose contents are not meant.
bool IsRemovedAsFile(RemoteFiles& files, const std::string& path) {
  try {
    RemoveFile(files, path);
    return true;
  } catch (const ToolError& error) {
    if (!ConcernsOneFile(error)) throw;
    const auto status = files.Find(path);
    if (!status || !status->is_directory()) throw;
    return false;
  }
}

void RemoveTrees(Context& context, RemoteFiles& files, const FsOptions& options) {
  PathByPath work(context, files);
  for (const auto& argument : options.paths) {
    const auto path = EfsPath(argument);
    bool is_file = true;
    const bool known = work.Try([&] { is_file = IsRemovedAsFile(files, path); });
    if (!known) continue;
    if (is_file) {
      work.Do(path, [] {});
    } else {
      RemoveTree(work, files, path);
    }
  }
  work.Conclude();
}

void RemoveFiles(Context& context, RemoteFiles& files, const FsOptions& options) {
  if (options.copy.recursive) return RemoveTrees(context, files, options);
  ForEachPath(context, files, options, [&](const std::string& path) { RemoveFile(files, path); });
}

void RemoveDirectories(Context& context, RemoteFiles& files, const FsOptions& options) {
  ForEachPath(context, files, options, [&](const std::string& path) { RemoveDirectory(files, path); });
}

void MakeDirectories(Context& context, RemoteFiles& files, const FsOptions& options) {
  ForEachPath(context, files, options, [&](const std::string& path) {
    if (options.parents) {
      files.MakeParents(path);
    } else {
      files.MakeDirectory(path);
    }
  });
}

void Move(Context& context, RemoteFiles& files, const FsOptions& options) {
  const auto from = EfsPath(options.paths[0]);
  auto to = EfsPath(options.paths[1]);
  if (const auto there = files.Find(to); there && there->is_directory()) to = JoinEfs(to, LastEfsName(from));
  files.Ask(Format("the renaming of {} to {}", NameText(from), NameText(to)), from, "KRAL_EFS2_DIAG_RENAME",
            [&](std::uint32_t* error) {
              return KRAL_EFS2_DIAG_RENAME(files.session().handle(), from.c_str(), to.c_str(), error);
            });
  context.out.Result({{"port", files.session().port()}, {"from", from}, {"to", to}}, "");
}

void Link(Context& context, RemoteFiles& files, const FsOptions& options) {
  const auto target = EfsPath(options.paths[0]);
  const auto link = EfsPath(options.paths[1]);
  files.Ask(Format("the link {}", NameText(link)), {}, "KRAL_EfsCreateLink", [&](std::uint32_t* error) {
    return KRAL_EfsCreateLink(files.session().handle(), target.c_str(), link.c_str(), error);
  });
  context.out.Result({{"port", files.session().port()}, {"target", target}, {"link", link}}, "");
}

void Sync(Context& context, RemoteFiles& files, const FsOptions& options) {
  const auto path = First(options);
  files.session().Begin();
  if (KRAL_EFS2_SyncWithWait(files.session().handle(), path.c_str(), options.wait_ms) == 0) {
    const ToolError error = files.session().Explain(Format("the sync of {}", NameText(path)));
    if (error.code() != ExitCode::kNoAnswer) throw error;
    throw ToolError(error.code(), error.what(), "--wait MS waits longer", error.record());
  }
  context.out.Result({{"port", files.session().port()}, {"path", path}}, "");
}

// --- Copying --------------------------------------------------------------------------------------------------------

// The colon tells the sides apart, so that a mistaken order is noticed before anything is overwritten.
void CheckSides(const std::string& handset_side, const std::string& local_side) {
  if (IsEfsArgument(handset_side) && !IsEfsArgument(local_side) && !local_side.empty()) return;
  throw ToolError(ExitCode::kUsage, Format("of {} and {}, one is no path of its side", handset_side, local_side),
                  "mark the handset's side with a colon: kral fs get :/nv/item item, kral fs put item :/nv/item");
}

std::string LocalTarget(const FsOptions& options) {
  return options.paths.size() > 1 ? options.paths[1] : ".";
}

void CheckGet(const FsOptions& options) {
  CheckSides(options.paths[0], LocalTarget(options));
}

void CheckRemove(const FsOptions& options) {
  if (!options.copy.recursive) return;
  for (const auto& path : options.paths) {
    const auto names = EfsNames(EfsPath(path));
    if (std::ranges::find(names, "..") != names.end()) {
      throw ToolError(ExitCode::kUsage, Format("{} may lead anywhere", NameText(path)),
                      "name what is removed without ..");
    }
    if (names.empty()) throw ToolError(ExitCode::kUsage, "the root directory is not removed", "name what is in it");
  }
}

void Get(Context& context, RemoteFiles& files, const FsOptions& options) {
  if (LocalTarget(options) == "-") return Cat(context, files, options);
  Copier(context, files, options.copy, "get").Get(EfsPath(options.paths[0]), LocalTarget(options));
}

std::vector<std::string> PutSources(const FsOptions& options) {
  return {options.paths.begin(), options.paths.end() - 1};
}

// Several files must have names of their own in the directory they go to.
void CheckPut(const FsOptions& options) {
  const auto sources = PutSources(options);
  std::set<std::string> names;
  for (const auto& source : sources) {
    CheckSides(options.paths.back(), source);
    const std::string name(LastName(source));
    if (sources.size() > 1 && (source == kStandardInput || name.empty() || name == "." || name == "..")) {
      throw ToolError(ExitCode::kUsage, Format("{} has no name among several files", source), "put it by itself");
    }
    if (!names.insert(name).second) {
      throw ToolError(ExitCode::kUsage, Format("two of the files would be {} in {}", name, options.paths.back()),
                      "put them one after the other, under other names");
    }
    if (source != kStandardInput && LookAt(source).kind == LocalKind::kMissing) {
      throw ToolError(ExitCode::kBadFile, Format("there is no {}", source), "check the name");
    }
  }
}

void Put(Context& context, RemoteFiles& files, const FsOptions& options) {
  auto copy = options.copy;
  copy.verify = !options.unverified;
  Copier(context, files, copy, "put").Put(PutSources(options), EfsPath(options.paths.back()));
}

// --- The command line -----------------------------------------------------------------------------------------------

constexpr int kMany = 1000;

struct Verb {
  const char* name;
  const char* help;
  const char* paths;  // what the line of usage has
  const char* meaning;
  int least;
  int most;
  void (*act)(Context& context, RemoteFiles& files, const FsOptions& options);
  void (*check)(const FsOptions& options) = [](const FsOptions&) {};  // before anything is opened
};

constexpr const char* kWhichDirectory = "On the handset; default: /";

constexpr Verb kVerbs[] = {
    {"cat", "Print a file", ":PATH", "A file of the handset", 1, 1, Cat},
    {"df", "Print how much room there is", "[:PATH]", "Of which file system; default: /", 0, 1, Room},
    {"get", "Copy from the handset", ":PATH [LOCAL]",
     "What is copied, and where to; - is the standard output; default: into this folder", 1, 2, Get, CheckGet},
    {"ln", "Make a symbolic link", ":TARGET :LINK", "Where the link leads, and where it is", 2, 2, Link},
    {"ls", "List a directory", "[:PATH]", kWhichDirectory, 0, 1, List},
    {"mkdir", "Make directories", ":PATH...", "Directories of the handset", 1, kMany, MakeDirectories},
    {"mv", "Rename or move", ":OLD :NEW", "Its path, and the one that it gets", 2, 2, Move},
    {"put", "Copy to the handset, and compare", "LOCAL... :PATH",
     "What is copied, and where to; - is the standard input", 2, kMany, Put, CheckPut},
    {"rm", "Remove files and links", ":PATH...", "What is removed", 1, kMany, RemoveFiles, CheckRemove},
    {"rmdir", "Remove empty directories", ":PATH...", "What is removed", 1, kMany, RemoveDirectories},
    {"stat", "Print what there is to know about a path", ":PATH", "On the handset", 1, 1, Stat},
    {"sync", "Have everything written to the flash", "[:PATH]", "Of which file system; default: /", 0, 1, Sync},
    {"tree", "List a directory and everything below", "[:PATH]", kWhichDirectory, 0, 1, Tree},
};

void Run(Context& context, const FsOptions& options, const Verb& verb) {
  verb.check(options);
  RemoteFiles files(context.session);
  if (options.packet_size != 0) {
    KRAL_SetEfsAutomaticPacketSize(files.session().handle(), 0);
    KRAL_SetEfsReadAndWritePacketSize(files.session().handle(), options.packet_size, options.packet_size);
  }
  verb.act(context, files, options);
}

void AddFlags(const Command& fs, FsOptions& options) {
  for (const char* name : {"get", "put"}) {
    const auto verb = fs.Find(name);
    verb.Flag("-r,--recursive", options.copy.recursive, "Copy directories with all that is in them");
    verb.Flag("--force", options.copy.force, "Copy files that are equal already, too");
  }
  fs.Find("rm").Flag("-r,--recursive", options.copy.recursive, "Remove directories with all that is in them");
  fs.Find("put").Flag("--item", options.copy.item, "Put item files; those there stay items anyway");
  fs.Find("put").Flag("--no-verify", options.unverified, "Do not read back and compare");
  fs.Find("mkdir").Flag("--parents", options.parents, "Make the directories above, too");
  fs.Find("sync").Add("--wait", options.wait_ms, "Milliseconds until it is given up").Between(1, kLongestSyncMs, "ms");
}

}  // namespace

void AddFsVerbs(const Command& root, Context& context) {
  const auto options = std::make_shared<FsOptions>();
  const auto fs = root.Noun("fs", "Files on the handset; a ':' in front of a path marks the handset's side");
  fs.Add("--packet-size", options->packet_size,
         "Bytes of a packet in transfers; otherwise the largest that the handset takes")
      .Between(kSmallestPacket, kLargestPacket, "bytes");
  for (const auto& verb : kVerbs) {
    const auto subcommand = fs.Verb(verb.name, verb.help);
    auto paths = subcommand.Add(verb.most > 1 ? "paths" : "path", options->paths, verb.meaning);
    paths.Count(verb.least, verb.most).Usage(verb.paths);
    if (verb.least > 0) paths.Required();
    paths.File();
    if (verb.act != Cat) subcommand.ForMany();
    subcommand.Checks([options, &verb] { verb.check(*options); });
    if (verb.act == Get) subcommand.Writes([options] { return std::vector<std::string>{LocalTarget(*options)}; });
    if (verb.act == Put) {
      subcommand.Reads([options] {
        auto files = PutSources(*options);
        std::erase(files, kStandardInput);
        return files;
      });
    }
    subcommand.Run([&context, options, &verb] { Run(context, *options, verb); });
  }
  AddFlags(fs, *options);
}

}  // namespace kral::tool
