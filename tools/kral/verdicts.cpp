// Makes one verdict of many.
#include "tools/kral/verdicts.h"

#include <algorithm>
#include <cmath>
#include <set>

#include "tools/kral/format.h"
#include "tools/kral/interrupt.h"

namespace kral::tool {
namespace {

using Verdicts = std::vector<const Verdict*>;

Json RowsOf(const Verdicts& verdicts) {
  Json rows = Json::array();
  for (const auto* verdict : verdicts) {
    Json row{{"port", verdict->port},
             {"ok", verdict->passed()},
             {"serial", verdict->serial},
             {"model", verdict->model},
             {"seconds", std::round(verdict->seconds * 1000) / 1000}};
    row.update(verdict->members);
    if (!verdict->passed()) row["error"] = ErrorJson(*verdict->failure);
    rows.push_back(std::move(row));
  }
  return rows;
}

std::string TableOf(const Verdicts& verdicts) {
  std::string text;
  for (const auto* verdict : verdicts) {
    text += Format("{:<7} {:<8} {:>8.1f} s  {}\n", Format("COM{}", verdict->port), verdict->serial, verdict->seconds,
                   verdict->passed() ? "passed" : Format("FAILED: {}", verdict->failure->what()));
  }
  return text;
}

}  // namespace

std::string Labelled(const Verdict& verdict) {
  std::string text;
  std::string_view rest = verdict.data;
  while (!rest.empty()) {
    const auto line = rest.substr(0, rest.find('\n'));
    rest.remove_prefix(std::min(rest.size(), line.size() + 1));
    text += Format("COM{}: {}\n", verdict.port, line);
  }
  return text;
}

void ConcludeVerdicts(Context& context, const Verdicts& verdicts) {
  std::vector<std::string> failed;
  std::set<ExitCode> codes;
  const ToolError* first = nullptr;
  for (const auto* verdict : verdicts) {
    if (verdict->passed()) continue;
    failed.push_back(Format("COM{}", verdict->port));
    codes.insert(verdict->failure->code());
    if (first == nullptr) first = &*verdict->failure;
  }
  if (!context.out.json()) WriteAside(TableOf(verdicts));
  context.found = {{"handsets", RowsOf(verdicts)}};
  const auto all = Counted(verdicts.size(), "handset");
  if (first == nullptr) {
    context.out.Result(context.found, "");
    if (!context.out.json()) context.out.Note(Format("{} passed", all));
    return;
  }
  if (Interrupted()) throw InterruptedError();
  const bool alike = failed.size() == verdicts.size() && codes.size() == 1;
  throw ToolError(alike ? first->code() : ExitCode::kSomeFailed,
                  alike ? Format("none of {} passed: {}", all, first->what())
                        : Format("{} of {} failed: {}", failed.size(), all, Joined(failed, ", ")),
                  first->hint());
}

}  // namespace kral::tool
