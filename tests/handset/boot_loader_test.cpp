// What the boot loader thinks of a host that errs; its packets and its life are tested with the library's side of them.
#include "handset/loaders/boot_loader.h"

#include <gtest/gtest.h>

#include "handset/virtual_handset.h"
#include "tests/support/handset_host.h"

namespace kral::handset {
namespace {

TEST(HandsetBootLoader, HostThatMakesAMistakeIsHeardNoMore) {
  VirtualHandset handset;
  test::HandsetHost host(handset);
  const auto loader = std::make_shared<BootLoader>();
  handset.EnterMode(loader);
  host.Read();
  handset.FromHost(FromHex("0D 00 00 00 0C 00 00 00 02 00 00 00"));
  EXPECT_NE(loader->problem(), "");
  handset.FromHost(FromHex("05 00 00 00 08 00 00 00"));
  EXPECT_EQ(host.Read(), "");
  EXPECT_FALSE(loader->transferred());
}

}  // namespace
}  // namespace kral::handset
