// Checks the order of the steps and puts those in between that the options stand for. No file is touched here.
#include "station/job_plan.h"

#include <algorithm>

#include "base/failure.h"

namespace kral::station {
namespace {

bool IsOfDownload(const Step& step) {
  return step.kind == StepKind::kProgrammer || step.kind == StepKind::kPartitionTable || step.kind == StepKind::kImage;
}

// Programmer, table, images.
int Rank(const Step& step) {
  return step.kind == StepKind::kProgrammer ? 0 : step.kind == StepKind::kPartitionTable ? 1 : 2;
}

std::string FileName(const std::string& path) {
  return path.substr(path.find_last_of("/\\") + 1);
}

std::string NameOf(const Step& step, uint32_t image) {
  switch (step.kind) {
    case StepKind::kIdentity:
      return "identity";
    case StepKind::kEnterLoader:
      return "enter loader";
    case StepKind::kProgrammer:
      return "flash programmer (" + FileName(step.file) + ")";
    case StepKind::kPartitionTable:
      return "partition table (" + FileName(step.file) + ")";
    case StepKind::kImage:
      return "image " + std::to_string(image) + " (" + FileName(step.file) + ")";
    case StepKind::kReset:
      return "restart";
    case StepKind::kMode:
      return "mode " + std::to_string(step.number);
    case StepKind::kRestore:
      return "restore (" + FileName(step.file) + ")";
    case StepKind::kVerify:
      return "verify (" + FileName(step.file) + ")";
  }
  return "";
}

std::optional<Plan> Wrong(const char* what) {
  Fail(Failure(KRAL_ERROR_ARGUMENT, "%s", what));
  return std::nullopt;
}

const char* WhatIsWrong(const std::vector<Step>& steps, size_t first, size_t last, uint32_t flags) {
  const bool enters = (flags & KRAL_VENTRIMS_ENTER_LOADER) != 0;
  const bool resets = (flags & KRAL_VENTRIMS_RESET) != 0;
  if (steps.empty()) return "the job has no steps";
  if (first == last) {
    if (enters) return "the loader is to be entered, but there is no flash programmer";
    return resets ? "a restart is to follow the download, but there is none" : nullptr;
  }
  const auto download = std::span(steps).subspan(first, last - first);
  if (!std::ranges::all_of(download, IsOfDownload)) return "a step in diagnostics stands between those of the download";
  if (!std::ranges::is_sorted(download, [](const Step& a, const Step& b) { return Rank(a) < Rank(b); }))
    return "flash programmer, partition table and images are not in this order";
  const bool has_programmer = download[0].kind == StepKind::kProgrammer;
  if (has_programmer && download.size() > 1 && download[1].kind == StepKind::kProgrammer)
    return "there is more than one flash programmer";
  if (enters && !has_programmer) return "the loader is to be entered, but there is no flash programmer";
  if (first > 0 && !enters) return "steps in diagnostics stand in front of the download, but the loader is not entered";
  if (last < steps.size() && !resets) return "steps in diagnostics stand behind the download, but no restart";
  return nullptr;
}

}  // namespace

std::optional<Plan> MakePlan(const std::vector<Step>& steps, uint32_t flags) {
  const auto begin = std::ranges::find_if(steps, IsOfDownload);
  const auto end = std::find_if(steps.rbegin(), steps.rend(), IsOfDownload).base();
  const auto first = static_cast<size_t>(begin - steps.begin());
  const size_t last = begin == steps.end() ? first : static_cast<size_t>(end - steps.begin());
  if (const char* const wrong = WhatIsWrong(steps, first, last, flags)) return Wrong(wrong);

  Plan plan;
  const bool in_diagnostics = first > 0 || (flags & KRAL_VENTRIMS_ENTER_LOADER) != 0;
  if (in_diagnostics && (steps[0].kind != StepKind::kIdentity))
    plan.push_back({.kind = StepKind::kIdentity, .asked_for = false});
  for (size_t i = 0; i < steps.size(); ++i) {
    if (i == first && (flags & KRAL_VENTRIMS_ENTER_LOADER) != 0)
      plan.push_back({.kind = StepKind::kEnterLoader, .asked_for = false});
    plan.push_back(steps[i]);
    if (i + 1 == last && (flags & KRAL_VENTRIMS_RESET) != 0)
      plan.push_back({.kind = StepKind::kReset, .asked_for = false});
  }
  uint32_t images = 0;
  KRAL_VENTRIMS_PROGRESS as_in_records{};
  for (Step& step : plan) {
    if (step.kind == StepKind::kImage) ++images;
    PutText(as_in_records.step_name, NameOf(step, images));
    step.name = as_in_records.step_name;
  }
  return plan;
}

bool BeginsInBootLoader(const Plan& plan) {
  return plan[0].kind == StepKind::kProgrammer && plan[0].number == KRAL_VENTRIMS_PROGRAMMER_BOOT;
}

}  // namespace kral::station
