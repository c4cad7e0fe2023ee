// kral info: who the handset is.
#include <array>
#include <string>
#include <vector>

#include "tools/kral/format.h"
#include "tools/kral/phone/operating_mode.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

// The report in its two forms: an object, and lines of label and value.
struct Report {
  Json members = Json::object();
  std::string text;

  void Line(std::string_view label, std::string_view value) { text += Format("{:<20}{}\n", label, value); }
};

template <std::size_t N>
std::string Text(const std::array<char, N>& characters) {
  return Printable({characters.data(), characters.size()});
}

void ReportVersion(Session& session, Report& report) {
  std::array<char, 11> compile_date{}, release_date{};
  std::array<char, 8> compile_time{}, release_time{}, directory{};
  std::uint8_t station_class = 0, air_revision = 0, model = 0, slot_cycle = 0, vocoder_major = 0, vocoder_minor = 0;
  std::uint16_t firmware = 0;
  session.Run("the version request", [&] {
    return KRAL_DIAG_VERNO_F(session.handle(), compile_date.data(), compile_time.data(), release_date.data(),
                             release_time.data(), directory.data(), &station_class, &air_revision, &model, &firmware,
                             &slot_cycle, &vocoder_major, &vocoder_minor);
  });
  report.members["version"] = {{"directory", Text(directory)},
                               {"compiled", {{"date", Text(compile_date)}, {"time", Text(compile_time)}}},
                               {"released", {{"date", Text(release_date)}, {"time", Text(release_time)}}},
                               {"station_class_mark", station_class},
                               {"air_interface_revision", air_revision},
                               {"mobile_model", model},
                               {"firmware_revision", firmware},
                               {"slot_cycle_index", slot_cycle},
                               {"vocoder", {{"major", vocoder_major}, {"minor", vocoder_minor}}}};
  report.Line("version directory", Text(directory));
  report.Line("compiled", Format("{} {}", Text(compile_date), Text(compile_time)));
  report.Line("released", Format("{} {}", Text(release_date), Text(release_time)));
  report.Line("station class mark", std::to_string(station_class));
  report.Line("air interface", Format("revision {}", air_revision));
  report.Line("mobile model", std::to_string(model));
  report.Line("firmware revision", std::to_string(firmware));
  report.Line("slot cycle index", std::to_string(slot_cycle));
  report.Line("vocoder", Format("{}.{}", vocoder_major, vocoder_minor));
}

void ReportBuild(Session& session, Report& report) {
  std::uint32_t hardware = 0, model_number = 0;
  std::vector<char> revision(KRAL_BUILD_ID_TEXT_SIZE), model(KRAL_BUILD_ID_TEXT_SIZE);
  session.Run("the build-identity request", [&] {
    return KRAL_DIAG_EXT_BUILD_ID_F(session.handle(), &hardware, &model_number, revision.data(), model.data());
  });
  report.members["build"] = {{"hardware_version", hardware},
                             {"mobile_model", model_number},
                             {"software_revision", Printable(revision.data())},
                             {"model", Printable(model.data())}};
  report.Line("hardware version", Format("0x{:08X}", hardware));
  report.Line("model", Format("{} (0x{:08X})", Printable(model.data()), model_number));
  report.Line("software revision", Printable(revision.data()));
}

void ReportMode(Session& session, Report& report) {
  std::uint32_t state = 0;
  session.Run("the operating-mode query", [&] { return ReadOperatingState(session, state); });
  report.members["mode"] = NameOfState(state);
  report.Line("mode", NameOfState(state));
}

void ReportSerialNumber(Session& session, Report& report) {
  std::uint32_t serial = 0;
  session.Run("the serial-number request", [&] { return KRAL_DIAG_READ_ESN_F(session.handle(), &serial); });
  report.members["esn"] = Format("{:08X}", serial);
  report.Line("esn", Format("0x{:08X}", serial));
}

// Not every handset knows every request: what it refuses is left out, with a note, and the rest is reported.
void ReportIfKnown(const Context& context, Session& session, Report& report, const char* member,
                   void (*part)(Session&, Report&)) {
  try {
    part(session, report);
  } catch (const ToolError& error) {
    if (error.code() != ExitCode::kRefused) throw;
    report.members[member] = Json();
    context.out.Note(error.what());
  }
}

void ShowInfo(Context& context) {
  Session session(context.session);
  Report report;
  report.members["port"] = session.port();
  report.Line("port", DescribePort(session.port()));
  ReportVersion(session, report);
  ReportIfKnown(context, session, report, "build", ReportBuild);
  ReportIfKnown(context, session, report, "mode", ReportMode);
  ReportIfKnown(context, session, report, "esn", ReportSerialNumber);
  context.out.Result(report.members, report.text);
}

}  // namespace

void AddInfoVerbs(const Command& root, Context& context) {
  const auto info = root.Verb("info", "Print the identity of the handset: version, build, mode, serial number");
  info.ForMany();
  info.Run([&context] { ShowInfo(context); });
}

}  // namespace kral::tool
