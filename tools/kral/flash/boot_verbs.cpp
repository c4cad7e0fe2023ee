// kral boot: the primary boot loader; kral flash all: a download from cold.
#include <memory>
#include <string>
#include <vector>

#include "tools/kral/flash/boot_target.h"
#include "tools/kral/flash/flash_images.h"
#include "tools/kral/flash/flash_many.h"
#include "tools/kral/format.h"
#include "tools/kral/many_handsets.h"
#include "tools/kral/port_names.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

Json ChipObject(const BootIdentity& identity) {
  return identity.chip ? Json(Format("{:08X}", *identity.chip)) : Json();
}

std::string DescribeIdentity(const BootIdentity& identity) {
  return Format("boot loader, transfer version {}, chip identity {}\n", identity.version,
                identity.chip ? Format("0x{:08X}", *identity.chip) : "not told");
}

void ShowInfo(Context& context, const BootOptions& options) {
  BootTarget target(context, options);
  const auto identity = target.Connect(true);
  context.out.Result(
      {{"port", target.session().port()}, {"version", identity.version}, {"chip_identity", ChipObject(identity)}},
      DescribeIdentity(identity));
}

void Load(Context& context, const BootOptions& options, const std::string& programmer) {
  CheckFile(programmer);
  BootTarget target(context, options);
  const auto identity = target.Connect(false);
  context.found["version"] = identity.version;
  target.Load(programmer);
  context.out.Result({{"port", target.session().port()}, {"version", identity.version}, {"loaded", programmer}},
                     Format("{} loaded; kral flash write goes on\n", programmer));
}

struct FlashAllArguments {
  BootOptions options;
  std::string programmer;
  std::vector<std::string> images;
  bool reset = false;
  bool dry_run = false;
};

// The ports as they can be told without asking any handset.
std::vector<std::string> PortsToBe(const Context& context, const FlashAllArguments& arguments) {
  auto session = context.session;
  if (context.all) {
    if (!arguments.options.enter) throw MustNameBootLoaders();
    return {"every port on which a handset answers"};
  }
  if (session.port.empty()) return {"the only port"};
  if (session.port.find("esn:") != std::string::npos) return {session.port};
  ResolvePortNames(session);
  std::vector<std::string> names;
  for (const auto port : WithoutTwins(ParsePorts(session.port), true)) names.push_back(DescribePort(port));
  return names;
}

void PrintFlashPlan(const Context& context, const FlashAllArguments& arguments, const std::vector<FlashImage>& images) {
  const auto ports = PortsToBe(context, arguments);
  Json port_names = Json::array();
  for (const auto& name : ports) port_names.push_back(name);
  Json rows = Json::array();
  auto text = Format("on {}:\n", Joined(ports, ", "));
  if (arguments.options.enter) text += "into the boot loader\n";
  text += Format("{}: by the boot transfer, and started\n", arguments.programmer);
  for (const auto& image : images) {
    rows.push_back(ImageObject(image));
    text += DescribeImage(image);
  }
  if (arguments.reset) text += "restart\n";
  const auto bytes = TotalBytes(images);
  text += Format("in all {} in {}; nothing was written\n", Counted(bytes, "byte"), Counted(images.size(), "image"));
  context.out.Result({{"dry_run", true},
                      {"ports", port_names},
                      {"enter", arguments.options.enter},
                      {"programmer", arguments.programmer},
                      {"images", rows},
                      {"bytes", bytes},
                      {"reset", arguments.reset}},
                     text);
}

void FlashAll(Context& context, const FlashAllArguments& arguments) {
  if (context.for_several() && !arguments.dry_run) {
    FlashPlan plan;
    plan.programmer = arguments.programmer;
    plan.enter = arguments.options.enter;
    plan.return_s = arguments.options.wait_s;
    plan.pre_done_delay_ms = arguments.options.pre_done_delay_ms;
    plan.images = arguments.images;
    plan.reset = arguments.reset;
    return FlashMany(context, plan);
  }
  std::vector<FlashImage> images;
  for (const auto& image : arguments.images) images.push_back(ReadFlashImage(image, KRAL_IMAGE_FORMAT_BY_CONTENT));
  if (arguments.dry_run) {
    CheckFile(arguments.programmer);
    return PrintFlashPlan(context, arguments, images);
  }
  BootTarget target(context, arguments.options);
  target.FlashAll(arguments.programmer, images);
  Json written = Json::array();
  for (const auto& image : images) written.push_back(ImageObject(image));
  context.found["written"] = written;
  if (arguments.reset) target.Reset();
  context.out.Result({{"port", target.session().port()},
                      {"programmer", arguments.programmer},
                      {"written", written},
                      {"bytes", TotalBytes(images)},
                      {"reset", arguments.reset}},
                     Format("{} in {} written and acknowledged\n", Counted(TotalBytes(images), "byte"),
                            Counted(images.size(), "image")));
}

void AddBootOptions(const Command& verb, BootOptions& options) {
  verb.Flag("--enter", options.enter, "The handset runs its software: send it into its boot loader first");
  verb.Add("--wait", options.wait_s, "Seconds for the port to appear").Between(0, 3600, "s").ShowDefault();
}

void AddLoadOptions(const Command& verb, BootOptions& options, std::string& programmer) {
  AddBootOptions(verb, options);
  verb.Add("--pre-done-delay", options.pre_done_delay_ms, "Milliseconds before the boot loader is told the end");
  verb.Add("programmer", programmer, "File of the flash programmer, as the boot loader wants it").Required();
}

}  // namespace

void AddBootVerbs(const Command& root, Context& context) {
  const auto boot = root.Noun("boot", "The primary boot loader of a handset without software");
  const auto options = std::make_shared<BootOptions>();
  const auto info = boot.Verb("info", "Tell version and chip identity; the boot loader then waits for an image");
  AddBootOptions(info, *options);
  info.ForMany(Command::InDownload::kBootLoader);
  info.Run([&context, options] { ShowInfo(context, *options); });

  const auto programmer = std::make_shared<std::string>();
  const auto load = boot.Verb("load", "Transfer a flash programmer, which starts at once");
  AddLoadOptions(load, *options, *programmer);
  load.Reads([programmer] { return std::vector<std::string>{*programmer}; });
  load.ForMany(Command::InDownload::kBootLoader);
  load.Run([&context, options, programmer] { Load(context, *options, *programmer); });

  const auto arguments = std::make_shared<FlashAllArguments>();
  const auto all =
      root.Find("flash").Verb("all", "From cold: boot transfer of a flash programmer, then images through it");
  AddLoadOptions(all, arguments->options, arguments->programmer);
  all.Add("images", arguments->images, "Image files, each as FILE or TYPE:FILE").Required();
  all.Flag("--reset", arguments->reset, "Restart the handset at the end, if its programmer knows how");
  all.Flag("--dry-run", arguments->dry_run, "Check the files and print the plan; no handset is touched");
  all.AsksNobody([arguments] { return arguments->dry_run; });
  all.ForMany();
  all.TakesPorts();
  all.Run([&context, arguments] { FlashAll(context, *arguments); });
}

}  // namespace kral::tool
