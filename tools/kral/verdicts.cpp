// Makes one verdict of many.
#include "tools/kral/verdicts.h"

#include <algorithm>
#include <cmath>
#include <optional>
#include <set>

#include "tools/kral/format.h"
#include "tools/kral/interrupt.h"
#include "tools/kral/page.h"
#include "tools/kral/run_report.h"
#include "tools/kral/safe_text.h"

namespace kral::tool {
namespace {

using Verdicts = std::vector<const Verdict*>;

double InMilliseconds(double seconds) {
  return std::round(seconds * 1000) / 1000;
}

Json StepsOf(const Verdict& verdict) {
  Json steps = Json::array();
  for (const auto& step : verdict.steps.all()) {
    steps.push_back(
        {{"step", step.name}, {"begin", InMilliseconds(step.begin)}, {"seconds", InMilliseconds(step.seconds())}});
  }
  return steps;
}

Json RowsOf(const Verdicts& verdicts) {
  Json rows = Json::array();
  for (const auto* verdict : verdicts) {
    Json row{{"port", verdict->port},
             {"ok", verdict->passed()},
             {"serial", verdict->serial},
             {"model", verdict->model},
             {"seconds", InMilliseconds(verdict->seconds)}};
    if (!verdict->steps.all().empty()) row["steps"] = StepsOf(*verdict);
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
                   verdict->passed() ? "passed" : Format("FAILED: {}", SafeText(verdict->failure->what())));
  }
  return text;
}

// What became of the handsets is told all the same when it cannot be written.
std::optional<ToolError> WriteReport(const Context& context, const Verdicts& verdicts) {
  if (context.report.empty()) return {};
  try {
    WritePage(context.report, RunPage({context.title, TimeNow(), context.session.slots}, verdicts), "--report");
    return {};
  } catch (const ToolError& error) {
    return error;
  }
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
  const auto unwritten = WriteReport(context, verdicts);
  if (unwritten && first != nullptr) context.out.Note(unwritten->what());
  const auto all = Counted(verdicts.size(), "handset");
  if (first == nullptr) {
    if (unwritten) throw ToolError(*unwritten);
    context.out.Result(context.found, "");
    if (!context.out.json()) context.out.Note(Format("{} passed", all));
    return;
  }
  if (Interrupted()) throw InterruptedError();
  const bool alike = failed.size() == verdicts.size() && codes.size() == 1;
  throw ToolError(alike ? first->code() : ExitCode::kSomeFailed,
                  verdicts.size() == 1 ? std::string(first->what())
                  : alike              ? Format("none of {} passed: {}", all, first->what())
                                       : Format("{} of {} failed: {}", failed.size(), all, Joined(failed, ", ")),
                  first->hint());
}

}  // namespace kral::tool
