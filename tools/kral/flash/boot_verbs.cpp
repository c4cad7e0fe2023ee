// kral boot: the primary boot loader; kral flash all: a download from cold.
#include <memory>
#include <string>
#include <vector>

#include "tools/kral/flash/boot_target.h"
#include "tools/kral/flash/flash_images.h"
#include "tools/kral/flash/flash_many.h"
#include "tools/kral/format.h"
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
};

void FlashAll(Context& context, const FlashAllArguments& arguments) {
  std::vector<FlashImage> images;
  for (const auto& image : arguments.images) images.push_back(ReadFlashImage(image, KRAL_IMAGE_FORMAT_BY_CONTENT));
  if (HasSeveralPorts(context)) {
    FlashPlan plan;
    plan.programmer = arguments.programmer;
    plan.enter = arguments.options.enter;
    plan.return_s = arguments.options.wait_s;
    plan.images = images;
    plan.reset = arguments.reset;
    return FlashMany(context, plan);
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
  load.ForMany(Command::InDownload::kBootLoader);
  load.Run([&context, options, programmer] { Load(context, *options, *programmer); });

  const auto arguments = std::make_shared<FlashAllArguments>();
  const auto all =
      root.Find("flash").Verb("all", "From cold: boot transfer of a flash programmer, then images through it");
  AddLoadOptions(all, arguments->options, arguments->programmer);
  all.Add("images", arguments->images, "Image files, each as FILE or TYPE:FILE").Required();
  all.Flag("--reset", arguments->reset, "Restart the handset at the end, if its programmer knows how");
  all.TakesPorts();
  all.Run([&context, arguments] { FlashAll(context, *arguments); });
}

}  // namespace kral::tool
