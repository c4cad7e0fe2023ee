// kral boot: the primary boot loader; kral flash all: a download from cold.
#include <fmt/format.h>

#include <CLI/CLI.hpp>
#include <memory>
#include <string>
#include <vector>

#include "tools/kral/flash/boot_target.h"
#include "tools/kral/flash/flash_images.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

Json ChipObject(const BootIdentity& identity) {
  return identity.chip ? Json(fmt::format("{:08X}", *identity.chip)) : Json();
}

std::string DescribeIdentity(const BootIdentity& identity) {
  return fmt::format("boot loader, transfer version {}, chip identity {}\n", identity.version,
                     identity.chip ? fmt::format("0x{:08X}", *identity.chip) : "not told");
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
                     fmt::format("{} loaded; kral flash write goes on\n", programmer));
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
  BootTarget target(context, arguments.options);
  target.FlashAll(arguments.programmer, images);
  Json written = Json::array();
  for (const auto& image : images) written.push_back(ImageObject(image));
  context.found["written"] = written;
  if (arguments.reset) target.Reset();
  context.out.Result(
      {{"port", target.session().port()},
       {"programmer", arguments.programmer},
       {"written", written},
       {"bytes", TotalBytes(images)},
       {"reset", arguments.reset}},
      fmt::format("{} bytes in {} images written and acknowledged\n", TotalBytes(images), images.size()));
}

void AddBootOptions(CLI::App& verb, BootOptions& options) {
  verb.add_flag("--enter", options.enter, "The handset runs its software: send it into its boot loader first");
  verb.add_option("--wait", options.wait_s, "Seconds for the port to appear")
      ->check(CLI::Range(0u, 3600u))
      ->capture_default_str();
}

void AddLoadOptions(CLI::App& verb, BootOptions& options, std::string& programmer) {
  AddBootOptions(verb, options);
  verb.add_option("--pre-done-delay", options.pre_done_delay_ms, "Milliseconds before the boot loader is told the end");
  verb.add_option("programmer", programmer, "File of the flash programmer, as the boot loader wants it")->required();
}

}  // namespace

void AddBootVerbs(CLI::App& app, Context& context) {
  auto* boot = app.add_subcommand("boot", "The primary boot loader of a handset without software");
  boot->require_subcommand(1);
  const auto options = std::make_shared<BootOptions>();
  auto* info = boot->add_subcommand("info", "Tell version and chip identity; the boot loader then waits for an image");
  AddBootOptions(*info, *options);
  info->callback([&context, options] { context.run = [&context, options] { ShowInfo(context, *options); }; });

  const auto programmer = std::make_shared<std::string>();
  auto* load = boot->add_subcommand("load", "Transfer a flash programmer, which starts at once");
  AddLoadOptions(*load, *options, *programmer);
  load->callback([&context, options, programmer] {
    context.run = [&context, options, programmer] { Load(context, *options, *programmer); };
  });

  const auto arguments = std::make_shared<FlashAllArguments>();
  auto* all = app.get_subcommand("flash")->add_subcommand(
      "all", "From cold: boot transfer of a flash programmer, then images through it");
  AddLoadOptions(*all, arguments->options, arguments->programmer);
  all->add_option("images", arguments->images, "Image files, each as FILE or TYPE:FILE")->required();
  all->add_flag("--reset", arguments->reset, "Restart the handset at the end, if its programmer knows how");
  all->callback([&context, arguments] { context.run = [&context, arguments] { FlashAll(context, *arguments); }; });
}

}  // namespace kral::tool
