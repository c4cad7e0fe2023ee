// kral doctor: what is wrong with ports, rights, other programs and lines, each with what mends it.
#include <algorithm>
#include <array>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "platform/port_access.h"
#include "tools/kral/format.h"
#include "tools/kral/interrupt.h"
#include "tools/kral/many_handsets.h"
#include "tools/kral/phone/link_check.h"
#include "tools/kral/port_report.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

constexpr double kUsualSeconds = 3;
constexpr double kLongestSeconds = 3600;
constexpr std::uint32_t kGoodLatencyMs = 1;
constexpr std::uint32_t kSlowRoundTripUs = 20'000;

// Programs that open every new port and ask whether it is a modem.
constexpr std::array<const char*, 1> kProbers{"ModemManager"};

struct Finding {
  std::optional<ExitCode> code;  // nothing: works all the same, if less well
  std::string text;
  std::string mend;
};

class Doctor {
 public:
  Doctor(const Context& context, double seconds) : context_(context), seconds_(seconds) {}

  void Look();
  Json Members() const;
  std::string Text() const;
  const std::vector<Finding>& findings() const { return findings_; }

 private:
  struct Patient {
    PortReport report;
    std::optional<LinkFigures> link;
  };

  void LookAtPrograms();
  void LookAtRights(const PortReport& report, const PortAccess& access);
  void LookAtState(const PortReport& report);
  void LookAtLatency(const PortReport& report, const PortAccess& access);
  SessionOptions OptionsOf(std::size_t number) const;
  void LookAtLines();
  void JudgeLine(const Patient& patient);
  void Found(Finding finding) { findings_.push_back(std::move(finding)); }

  const Context& context_;
  const double seconds_;
  std::vector<Patient> patients_;
  std::vector<Finding> findings_;
};

void Doctor::LookAtPrograms() {
  for (const std::string name : kProbers) {
    if (FindProcess(name) == 0) continue;
    Found({{},
           Format("{} is running: it opens every new port and sends to it", name),
           Format("sudo systemctl disable --now {}", name)});
  }
}

void Doctor::LookAtRights(const PortReport& report, const PortAccess& access) {
  if (report.info.state != KRAL_PORT_NOT_PERMITTED) return;
  const auto text = Format("{} may not be opened by this user", DescribePort(report.port));
  if (access.group.empty()) {
    Found({ExitCode::kPortInUse, text, Format("sudo chmod a+rw {}", report.info.device)});
  } else if (access.is_listed && !access.is_member) {
    Found({ExitCode::kPortInUse, Format("{}: the group {} is the user's from the next login on", text, access.group),
           Format("newgrp {}, or log out and in again", access.group)});
  } else {
    Found({ExitCode::kPortInUse, Format("{}, but by the group {}", text, access.group),
           Format("sudo usermod -aG {} $USER, then log in again", access.group)});
  }
}

void Doctor::LookAtState(const PortReport& report) {
  const auto name = DescribePort(report.port);
  switch (report.info.state) {
    case KRAL_PORT_BUSY:
      return Found({ExitCode::kPortInUse, Format("{} is {}", name, StateText(report)),
                    report.info.process == 0 ? Format("fuser -v {}", report.info.device)
                                             : Format("kill {}", report.info.process)});
    case KRAL_PORT_NOT_FOUND:
      return Found({ExitCode::kNoPort, Format("there is no port {}", name), "kral ports"});
    case KRAL_PORT_FAILED:
    case KRAL_PORT_GONE:
      return Found({ExitCode::kNoPort, Format("{} cannot be opened as a serial port", name),
                    Format("kral -p {} --log /dev/stderr info", report.port)});
    default:
      break;
  }
  if (report.info.answers == KRAL_ANSWERS_LOADER || report.info.answers == KRAL_ANSWERS_FLASH_PROGRAMMER) {
    Found({{},
           Format("{} runs no diagnostics: {}", name, StateText(report)),
           Format("kral -p {} flash reset", report.port)});
  } else if (report.info.answers == KRAL_ANSWERS_BOOT_LOADER) {
    Found({{}, Format("{} is in its boot loader, and has said its hello now", name), "power the handset off and on"});
  }
}

void Doctor::LookAtLatency(const PortReport& report, const PortAccess& access) {
  if (!access.latency_ms || *access.latency_ms <= kGoodLatencyMs) return;
  Found({{},
         Format("the adapter of {} keeps short answers back for {} ms", DescribePort(report.port), *access.latency_ms),
         Format("echo 1 | sudo tee {}", access.latency_file)});
}

// Each line has its own text log and trace.
SessionOptions Doctor::OptionsOf(std::size_t number) const {
  auto options = context_.session;
  const auto port = patients_[number].report.port;
  options.port = std::to_string(port);
  for (auto* const file : {&options.log_file, &options.trace.file, &options.trace.file_on_failure}) {
    const auto own = FileOfPort(*file, options, port, number + 1);
    if (patients_.size() > 1 && !file->empty() && own == *file) {
      throw ToolError(ExitCode::kUsage, Format("{} would be written for all ports", *file), "put {port} into its name");
    }
    *file = own;
  }
  return options;
}

void Doctor::LookAtLines() {
  std::mutex mutex;
  std::vector<SessionOptions> options;
  for (std::size_t number = 0; number < patients_.size(); ++number) options.push_back(OptionsOf(number));
  InParallel(patients_.size(), [&](std::size_t number) {
    auto& patient = patients_[number];
    if (patient.report.info.answers != KRAL_ANSWERS_DIAGNOSTICS) return;
    try {
      Session session(options[number]);
      patient.link = CheckLink(session, seconds_);
    } catch (const ToolError& error) {
      const std::lock_guard lock(mutex);
      if (error.code() != ExitCode::kInterrupted) Found({error.code(), error.what(), error.hint()});
    }
  });
}

void Doctor::JudgeLine(const Patient& patient) {
  if (!patient.link) return;
  const auto& link = *patient.link;
  const auto name = DescribePort(patient.report.port);
  if (link.lost > 0 || link.garbled > 0) {
    Found({ExitCode::kLink,
           Format("{} of {} loopbacks on {} were lost and {} garbled", link.lost, link.count, name, link.garbled),
           Format("try another cable and another socket, then kral -p {} doctor", patient.report.port)});
  }
  if (link.most_us > kSlowRoundTripUs) {
    Found({{},
           Format("round trips on {} take up to {:.1f} ms", name, link.most_us / 1000.0),
           "plug the adapter into a socket of the machine itself, and look for what else keeps the machine busy: top"});
  }
}

void Doctor::Look() {
  const auto& port = context_.session.port;
  for (auto& report : ReportPorts(port.empty() ? ListPorts() : ParsePorts(port), true))
    patients_.push_back({report, {}});
  LookAtPrograms();
  if (patients_.empty()) {
    Found({ExitCode::kNoPort, "this machine has no serial port", "plug the handset in; sudo dmesg | tail tells of it"});
  }
  for (const auto& patient : patients_) {
    const auto access = DescribePortAccess(patient.report.info.device);
    LookAtRights(patient.report, access);
    LookAtState(patient.report);
    LookAtLatency(patient.report, access);
    if (!port.empty() && patient.report.info.answers == KRAL_ANSWERS_NOTHING) {
      Found({ExitCode::kNoAnswer, Format("nothing answers on {}", DescribePort(patient.report.port)),
             "check that this is the handset's diagnostic port and that the handset is on"});
    }
  }
  LookAtLines();
  ThrowIfInterrupted();
  for (const auto& patient : patients_) JudgeLine(patient);
}

Json Doctor::Members() const {
  Json ports = Json::array();
  for (const auto& patient : patients_) {
    ports.push_back(PortJson(patient.report));
    if (patient.link) ports.back()["round_trips"] = patient.link->ToJson();
  }
  Json findings = Json::array();
  for (const auto& finding : findings_) {
    findings.push_back(
        {{"level", finding.code ? "problem" : "warning"}, {"text", finding.text}, {"mend", finding.mend}});
  }
  std::array<char, KRAL_LIBRARY_VERSION_SIZE> version{};
  KRAL_GetLibraryVersion(version.data());
  return {{"library", version.data()}, {"system", SystemName()}, {"ports", ports}, {"findings", findings}};
}

std::string Doctor::Text() const {
  std::array<char, KRAL_LIBRARY_VERSION_SIZE> version{};
  KRAL_GetLibraryVersion(version.data());
  std::string text = Format("{} on {}\n", version.data(), SystemName());
  for (const auto& patient : patients_) {
    const auto state = StateText(patient.report);
    text += Format("{}  {}", DescribePort(patient.report.port), state.empty() ? "free" : state);
    if (patient.link) {
      text += Format("  {} round trips: p50 {:.1f} ms, p99 {:.1f} ms, {} lost, {} garbled", patient.link->count,
                     patient.link->half_us / 1000.0, patient.link->most_us / 1000.0, patient.link->lost,
                     patient.link->garbled);
    }
    text += "\n";
  }
  for (const auto& finding : findings_) {
    text += Format("{}: {}\n  {}\n", finding.code ? "problem" : "warning", finding.text, finding.mend);
  }
  return text;
}

// The code of the first problem; all of them are told as data.
void Diagnose(Context& context, double seconds) {
  Doctor doctor(context, seconds);
  doctor.Look();
  const auto& findings = doctor.findings();
  const auto first = std::ranges::find_if(findings, [](const Finding& finding) { return finding.code.has_value(); });
  if (first == findings.end()) {
    return context.out.Result(doctor.Members(), doctor.Text() + (findings.empty() ? "nothing is wrong\n" : ""));
  }
  context.found = doctor.Members();
  if (!context.out.json()) context.out.Data(doctor.Text());
  throw ToolError(*first->code, first->text, first->mend);
}

}  // namespace

void AddDoctorVerbs(const Command& root, Context& context) {
  const auto seconds = std::make_shared<double>(kUsualSeconds);
  const auto doctor =
      root.Verb("doctor", "Look for what is wrong with ports, rights and lines, and tell what mends it");
  doctor.Add("--seconds", *seconds, "How long loopbacks are sent to each handset")
      .Between(0, kLongestSeconds, "s")
      .ShowDefault();
  doctor.TakesPorts();
  doctor.Run([&context, seconds] { Diagnose(context, *seconds); });
}

}  // namespace kral::tool
