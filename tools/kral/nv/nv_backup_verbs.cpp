// kral nv backup, restore, verify: the handset's items and item files to and from a PKV file.
#include <array>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "tools/kral/abort_on_interrupt.h"
#include "tools/kral/call_failure.h"
#include "tools/kral/format.h"
#include "tools/kral/handset_identity.h"
#include "tools/kral/interrupt.h"
#include "tools/kral/nv/nv_items.h"
#include "tools/kral/nv/pkv_origin.h"
#include "tools/kral/progress.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

struct BackupOptions {
  NvOptions nv;
  std::string file;
  std::string items = "0-9999";
  std::uint16_t subscriptions = 1;
  bool dry_run = false;
  bool force = false;
  std::vector<std::uint16_t> read_only;
};

using Job = std::uint8_t(KRAL_CALL*)(KRAL_HANDLE handle, const char* file, std::uint32_t* status);

// What a verb calls the results of the library.
struct Words {
  const char* done;
  const char* skipped;
  const char* different;
};

constexpr Words kBackupWords{"read", "without-value", "different"};
constexpr Words kRestoreWords{"written", "skipped", "reads-back-differently"};
constexpr Words kVerifyWords{"equal", "skipped", "different"};
constexpr Words kDryRunWords{"equal-already", "skipped", "would-be-written"};

const char* WordOf(std::uint32_t result, const Words& words) {
  switch (result) {
    case KRAL_PKV_DONE:
      return words.done;
    case KRAL_PKV_SKIPPED:
      return words.skipped;
    case KRAL_PKV_REFUSED:
      return "refused";
    case KRAL_PKV_DIFFERENT:
      return words.different;
    case KRAL_PKV_NOT_READ_BACK:
      return "not-read-back";
    default:
      return "not-reached";
  }
}

// One run of a job: its progress, and what became of each item. The library's callback carries the handle and nothing
// else, so there is one at a time on a thread.
class JobRun {
 public:
  JobRun(const Context& context, const char* work, const Words& words, bool keeps_all)
      : words_(words), keeps_all_(keeps_all), progress_(context.out, work, 0, Progress::Unit::kItems) {
    running_ = this;
  }
  ~JobRun() { running_ = nullptr; }
  JobRun(const JobRun&) = delete;
  JobRun& operator=(const JobRun&) = delete;

  std::uint32_t Run(Session& session, Job job, const std::string& file) {
    session.Begin();
    KRAL_PKV_ConfigureCallBack(session.handle(), OnItem);
    KRAL_ConfigureEfs2CallBacks(session.handle(), nullptr, OnEntry);
    std::uint32_t status = KRAL_PKV_STATUS_LOST;
    {
      const AbortOnInterrupt watch(session.handle());
      if (job(session.handle(), file.c_str(), &status) == 0) record_ = LastError(session.handle());
    }
    KRAL_ConfigureEfs2CallBacks(session.handle(), nullptr, nullptr);
    KRAL_PKV_ConfigureCallBack(session.handle(), nullptr);
    KRAL_PKV_GetCounts(session.handle(), &counts_);
    return status;
  }

  const KRAL_PKV_COUNTS& counts() const { return counts_; }
  const std::optional<KRAL_ERROR>& record() const { return record_; }  // of a run that failed
  const Json& items() const { return items_; }
  const std::string& text() const { return text_; }

  Json Counts() const {
    Json members = Json::object();
    for (const auto& [result, count] : All()) members[WordOf(result, words_)] = count;
    return members;
  }
  // "24 written, 1 skipped"
  std::string Summary() const {
    std::string text;
    for (const auto& [result, count] : All()) {
      if (count == 0 && result != KRAL_PKV_DONE) continue;
      text += Format("{}{} {}", text.empty() ? "" : ", ", count, WordOf(result, words_));
    }
    return text;
  }

 private:
  std::array<std::pair<std::uint32_t, std::uint32_t>, 6> All() const {
    return {{{KRAL_PKV_DONE, counts_.done},
             {KRAL_PKV_SKIPPED, counts_.skipped},
             {KRAL_PKV_REFUSED, counts_.refused},
             {KRAL_PKV_DIFFERENT, counts_.different},
             {KRAL_PKV_NOT_READ_BACK, counts_.not_read_back},
             {KRAL_PKV_NOT_REACHED, counts_.not_reached}}};
  }

  static std::uint8_t KRAL_CALL OnItem(const KRAL_PKV_ITEM* item, const char* path, std::uint32_t done,
                                       std::uint32_t total, KRAL_HANDLE) {
    running_->Note(*item, path);
    if (std::exchange(running_->listed_, 0) != 0) running_->progress_.Describe("");
    running_->progress_.SetTotal(total);
    running_->progress_.Update(done);
    return Interrupted() ? 0 : 1;
  }

  // What a backup will read is found out first.
  static void KRAL_CALL OnEntry(const KRAL_EFS_ENTRY* entry, KRAL_HANDLE) {
    running_->progress_.Describe(entry->name);
    running_->progress_.Update(++running_->listed_);
  }

  void Note(const KRAL_PKV_ITEM& item, const char* path) {
    const auto* word = WordOf(item.result, words_);
    const bool worth_a_line = item.result != KRAL_PKV_DONE && (keeps_all_ || item.result != KRAL_PKV_SKIPPED);
    if (!keeps_all_ && !worth_a_line) return;
    Json row = Json::object();
    std::string name;
    if (path != nullptr) {
      name = Printable(path);
      row["path"] = name;
    } else {
      name = Format("item {}", item.id);
      row["id"] = item.id;
      if (item.index != 0) name += Format("[{}]", item.index);
      row["index"] = item.index;
      if (item.subscription != 0) name += Format(" of subscription {}", item.subscription);
      row["subscription"] = item.subscription;
    }
    row["result"] = word;
    row["status"] = item.status;
    items_.push_back(std::move(row));
    if (worth_a_line) text_ += Format("{}: {}{}\n", name, word, StatusText(item));
  }

  static std::string StatusText(const KRAL_PKV_ITEM& item) {
    return item.status != 0 ? Format(", status {}", item.status) : "";
  }

  static inline thread_local JobRun* running_ = nullptr;

  const Words words_;
  const bool keeps_all_;  // or only those that went wrong
  Progress progress_;
  std::uint64_t listed_ = 0;
  KRAL_PKV_COUNTS counts_{};
  std::optional<KRAL_ERROR> record_;
  Json items_ = Json::array();
  std::string text_;
};

ToolError BadFile(const std::string& file, std::uint32_t status, const std::optional<KRAL_ERROR>& record) {
  constexpr const char* kHint = "check the file and the disk that it is on, then run the command again";
  if (record && record->code == KRAL_ERROR_BAD_FILE) return {ExitCode::kBadFile, record->text, kHint, record};
  const char* const fault = status == KRAL_PKV_STATUS_NO_STORAGE ? "is no PKV file"
                            : status == KRAL_PKV_STATUS_BAD_ITEM ? "holds a damaged item"
                                                                 : "cannot be used";
  return {ExitCode::kBadFile, Format("{} {}", file, fault), kHint, record};
}

// The end of a job that did not come out as wanted.
ToolError Explain(const Session& session, const char* work, const std::string& file, std::uint32_t status,
                  const KRAL_PKV_COUNTS& counts, const std::optional<KRAL_ERROR>& record) {
  const std::string where = Format("the {} on {}", work, DescribePort(session.port()));
  switch (status) {
    case KRAL_PKV_STATUS_STOPPED:
      return InterruptedError();
    case KRAL_PKV_STATUS_LOST:
      return {ExitCode::kLost, Format("the handset stopped answering during {}", where),
              "check the cable, then run the command again", record};
    case KRAL_PKV_STATUS_NOTHING_READ:
      if (counts.refused > 0) {
        return {ExitCode::kRefused,
                Format("the handset on {} gave no item and refused {}", DescribePort(session.port()), counts.refused),
                "the result names them; some may need an unlock or another mode"};
      }
      return {ExitCode::kRefused, Format("the handset on {} gave no item", DescribePort(session.port())),
              "check the range of --items"};
    case KRAL_PKV_STATUS_INCOMPLETE:
      return {ExitCode::kRefused,
              Format("the handset on {} refused {}; {} holds the others", DescribePort(session.port()),
                     Counted(counts.refused, "item"), file),
              "the result names them; some may need an unlock or another mode"};
    case KRAL_PKV_STATUS_NOT_WRITTEN:
      if (counts.refused > 0) {
        return {ExitCode::kRefused,
                Format("the handset on {} refused {}", DescribePort(session.port()), Counted(counts.refused, "item")),
                "the result names them; some may need an unlock or another mode"};
      }
      return {ExitCode::kMismatch,
              Format("not read back as written: {}", Counted(counts.different + counts.not_read_back, "item")),
              "the result names them"};
    case KRAL_PKV_STATUS_DIFFERENT:
      return {ExitCode::kMismatch, Format("{} and the handset on {} differ", file, DescribePort(session.port())),
              "the result names the items; kral nv restore writes them"};
    case KRAL_PKV_STATUS_UNEXPECTED:
      return {ExitCode::kInternal, Format("{} failed within the library", where), "--log FILE tells more", record};
    default:
      return BadFile(file, status, record);
  }
}

// The values of one model may do harm in another. Those of another handset of the same model are what a golden file is
// for; it is told all the same.
void CheckOrigin(Context& context, Session& session, const BackupOptions& options) {
  const auto origin = OriginOf(options.file);
  const auto model = origin.model.empty() ? std::string() : IfTold(session, ModelOf);
  const auto serial = origin.serial.empty() ? std::string() : IfTold(session, SerialOf);
  if (!serial.empty() && serial != origin.serial) {
    context.out.Note(Format("{} is of the handset {}; {} has {}", options.file, origin.serial,
                            DescribePort(session.port()), serial));
  }
  if (model.empty() || model == origin.model) return;
  const auto other = Format("{} is of the model {}, and the handset on {} is {}", options.file, origin.model,
                            DescribePort(session.port()), model);
  if (options.dry_run || options.force) return context.out.Note(other);
  throw ToolError(ExitCode::kSafetyStop, other, "nothing was written; --force restores it all the same");
}

void RunJob(Context& context, const BackupOptions& options, const char* work, Job job, const Words& words,
            bool keeps_all, bool restores = false) {
  Session session(context.session);
  if (restores) CheckOrigin(context, session, options);
  const NvItems definitions(session, options.nv);  // the library then knows arrays, and items beyond the range
  if (job == KRAL_BackupNVFromMobileToPKV) {
    const auto [first, last] = ParseIdRange(options.items);
    KRAL_PKV_ConfigureBackup(session.handle(), first, last, options.subscriptions);
  }
  if (!options.read_only.empty()) {
    KRAL_DIAG_NV_WRITE_BatchQueue_SetRO_List(session.handle(), options.read_only.data(),
                                             static_cast<std::uint16_t>(options.read_only.size()));
  }
  std::uint32_t status = 0;
  Json members{{"port", session.port()}, {"file", options.file}};
  std::string text;
  KRAL_PKV_COUNTS counts{};
  std::optional<KRAL_ERROR> record;
  {
    JobRun run(context, work, words, keeps_all);
    status = run.Run(session, job, options.file);
    members["counts"] = run.Counts();
    members["items"] = run.items();
    text = run.text() + run.Summary() + "\n";
    counts = run.counts();
    record = run.record();
  }
  if (status == KRAL_PKV_STATUS_DONE || (options.dry_run && status == KRAL_PKV_STATUS_DIFFERENT)) {
    return context.out.Result(members, text);
  }
  if (counts.total > 0 && !context.out.json()) context.out.Data(text);
  context.found = members;
  throw Explain(session, work, options.file, status, counts, record);
}

void Backup(Context& context, const BackupOptions& options) {
  ParseIdRange(options.items);
  RunJob(context, options, "backup", KRAL_BackupNVFromMobileToPKV, kBackupWords, false);
}

void Restore(Context& context, const BackupOptions& options) {
  if (options.dry_run) return RunJob(context, options, "dry run", KRAL_PKV_Verify, kDryRunWords, true, true);
  RunJob(context, options, "restore", KRAL_RestoreNVFromPKV, kRestoreWords, true, true);
}

void Verify(Context& context, const BackupOptions& options) {
  RunJob(context, options, "comparison", KRAL_PKV_Verify, kVerifyWords, true);
}

}  // namespace

void AddNvBackupVerbs(const Command& root, Context& context) {
  const auto options = std::make_shared<BackupOptions>();
  const auto nv = root.Find("nv");
  const auto add = [&](const char* name, const char* help, void (*act)(Context&, const BackupOptions&)) {
    const auto verb = nv.Verb(name, help);
    verb.Add("file", options->file, "PKV file").Required().File();
    verb.ForMany();
    AddDefinitionOptions(verb, options->nv);
    verb.Run([&context, options, act] { act(context, *options); });
    return verb;
  };
  const auto backup = add("backup", "Read all items and item files into a PKV file", Backup);
  backup.Checks([options] { ParseIdRange(options->items); });
  backup.Writes([options] { return std::vector<std::string>{options->file}; });
  backup.Add("--items", options->items, "Range of item ids to read");
  backup.Add("--subscriptions", options->subscriptions, "How many subscriptions the handset has").Between(1, 16);
  const auto restore = add("restore", "Write what a PKV file holds to the handset and read it back", Restore);
  const auto verify = add("verify", "Compare a PKV file with the handset", Verify);
  for (const auto& verb : {restore, verify}) {
    verb.Reads([options] { return std::vector<std::string>{options->file}; });
  }
  restore.Flag("--dry-run", options->dry_run, "Only tell what would be written");
  restore.Flag("--force", options->force, "Also what was read from another model");
  restore.Add("--read-only", options->read_only, "Items that may be read-only (0,447): skipped, not refused")
      .Separated(',')
      .OneEach();
}

}  // namespace kral::tool
