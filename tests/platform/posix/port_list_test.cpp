// COM numbers from folders and names of the test's own.
#include "platform/port_list.h"

#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <unistd.h>

#include "platform/environment.h"
#include "platform/posix/port_sources.h"
#include "platform/pseudo_terminal.h"
#include "platform/serial_device.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral {
namespace {

namespace fs = std::filesystem;

class PortListTest : public testing::Test {
 protected:
  PortListTest() {
    fs::create_directories(folder_.Path("tty"));
    fs::create_directories(folder_.Path("first"));
    fs::create_directories(folder_.Path("second"));
    sources_.tty_class = folder_.Path("tty");
    sources_.link_folders = {folder_.Path("first"), folder_.Path("second")};
  }

  // A tty of the system; `type` as the kernel tells it for serial chips.
  void AddTty(const std::string& name, bool device, const std::string& type = "") {
    fs::create_directories(folder_.Path("tty/" + name + (device ? "/device" : "")));
    if (!type.empty()) folder_.Add("tty/" + name + "/type", type + "\n");
  }
  void AddLink(const std::string& name) { fs::create_symlink("/dev/null", folder_.Path(name)); }

  std::vector<uint16_t> Listed() {
    std::vector<uint16_t> ports = {999};
    EXPECT_TRUE(ListComPorts(sources_, ports));
    return ports;
  }

  test::TempFolder folder_;
  PortSources sources_;
};

TEST_F(PortListTest, TtysWithHardwareAreListedInTheirRanges) {
  EXPECT_TRUE(Listed().empty());
  AddTty("tty1", false);
  AddTty("ttyS0", true, "4");
  AddTty("ttyS1", true, "0");   // the kernel's entry for a chip that is not there
  AddTty("ttyS2", false, "4");  // nothing behind it
  AddTty("ttyS63", true, "4");
  AddTty("ttyS64", true, "4");  // would run into the next range
  AddTty("ttyUSB0", true);
  AddTty("ttyUSB64", true);
  AddTty("ttyUSB01", true);  // not a name of the kernel's
  AddTty("ttyACM2", true);
  AddTty("ttyACM127", true);
  AddTty("ttyAMA0", true);
  EXPECT_EQ(Listed(), (std::vector<uint16_t>{1, 64, 65, 131}));
}

TEST_F(PortListTest, NamesAndLinksAreListedOnceAndInOrder) {
  AddTty("ttyS4", true, "4");
  AddLink("first/com12");
  AddLink("second/com12");
  AddLink("second/com3");
  for (const char* other : {"first/com", "first/com0", "first/com256", "first/com07", "first/com9x", "first/COM8"}) {
    AddLink(other);
  }
  sources_.variables = {{200, "/dev/x"}, {12, "/dev/y"}};
  EXPECT_EQ(Listed(), (std::vector<uint16_t>{3, 5, 12, 200}));
}

TEST_F(PortListTest, WithoutTheSystemsListNamedPortsAreListedAlone) {
  sources_.tty_class = folder_.Path("missing");
  std::vector<uint16_t> ports;
  EXPECT_FALSE(ListComPorts(sources_, ports));
  sources_.variables = {{7, "/dev/x"}};
  EXPECT_EQ(Listed(), std::vector<uint16_t>{7});
}

TEST_F(PortListTest, TheFirstNameOfANumberWins) {
  const std::vector<std::pair<int, std::string>> plain = {{1, "/dev/ttyS0"},
                                                          {64, "/dev/ttyS63"},
                                                          {65, "/dev/ttyUSB0"},
                                                          {128, "/dev/ttyUSB63"},
                                                          {129, "/dev/ttyACM0"},
                                                          {255, "/dev/ttyACM126"},
                                                          {0, ""},
                                                          {256, ""}};
  for (const auto& [number, device] : plain) EXPECT_EQ(ComPortDevice(sources_, number), device);
  AddLink("second/com1");
  EXPECT_EQ(ComPortDevice(sources_, 1), folder_.Path("second/com1"));
  AddLink("first/com1");
  EXPECT_EQ(ComPortDevice(sources_, 1), folder_.Path("first/com1"));
  uint32_t link_place = UINT32_MAX;
  EXPECT_EQ(ComPortDevice(sources_, 1, link_place), folder_.Path("first/com1"));
  sources_.variables = {{1, "/dev/pts/7"}};
  EXPECT_EQ(ComPortDevice(sources_, 1), "/dev/pts/7");

  // For who opens it again: by a name in front, and by none behind.
  uint32_t place = link_place;
  EXPECT_EQ(ComPortDevice(sources_, 1, place), "/dev/pts/7");
  sources_.variables.clear();
  EXPECT_EQ(ComPortDevice(sources_, 1, place), "");
  fs::remove(folder_.Path("first/com1"));
  EXPECT_EQ(ComPortDevice(sources_, 1, link_place), "") << "neither the other link, nor the system's port";
}

// --- What is known of a port -----------------------------------------------------------------------------------------

TEST_F(PortListTest, AUsbDeviceIsNamedByItsSocketAndItsPortsByTheirInterface) {
  const std::string device = "devices/usb1/1-4/1-4.2";
  fs::create_directories(folder_.Path(device + "/1-4.2:1.3/ttyUSB1"));
  fs::create_directories(folder_.Path("tty/ttyUSB1"));
  fs::create_symlink(folder_.Path(device + "/1-4.2:1.3/ttyUSB1"), folder_.Path("tty/ttyUSB1/device"));
  for (const auto& [name, text] : {std::pair{"idVendor", "1d6b"},
                                   {"idProduct", "00a2"},
                                   {"serial", "80C0FFEE"},
                                   {"manufacturer", "Acme"},
                                   {"product", "Handset"},
                                   {"1-4.2:1.3/bInterfaceNumber", "03"},
                                   {"1-4.2:1.3/interface", "Diagnostics"}}) {
    folder_.Add(device + "/" + name, std::string(text) + "\n");
  }
  folder_.Add("devices/usb1/1-4/idVendor", "ffff\n");  // the hub, which is further up
  sources_.variables = {{7, "/dev/ttyUSB1"}};
  for (const int number : {7, 66}) {
    const PortInfo info = DescribeComPort(sources_, number);
    EXPECT_EQ(info.device, "/dev/ttyUSB1");
    EXPECT_EQ(info.usb_path, "1-4.2");
    EXPECT_EQ(info.usb_interface, 3);
    EXPECT_EQ(info.vendor, 0x1D6B);
    EXPECT_EQ(info.product, 0xA2);
    EXPECT_EQ(info.serial, "80C0FFEE");
    EXPECT_EQ(info.description, "Acme Handset Diagnostics");
  }
  EXPECT_EQ(DescribeComPort(sources_, 1).usb_path, "");
}

TEST_F(PortListTest, WhatStandsInTheWayOfAPortIsToldWithoutOpeningIt) {
  const auto obstacle = [this](const std::string& device) {
    sources_.variables = {{7, device}};
    return DescribeComPort(sources_, 7).obstacle;
  };
  sources_.processes = folder_.Path("processes");
  fs::create_directories(folder_.Path("processes/41/fd"));
  EXPECT_EQ(obstacle("/dev/null"), PortObstacle::kNone);
  EXPECT_EQ(obstacle("/nonexistent"), PortObstacle::kNotFound);
  EXPECT_EQ(obstacle(folder_.Add("file", "")), PortObstacle::kNotFound);
  EXPECT_EQ(obstacle(""), PortObstacle::kNotFound);

  // Another program, by what it has open.
  fs::create_directories(folder_.Path("processes/42/fd"));
  fs::create_symlink("/dev/null", folder_.Path("processes/42/fd/3"));
  folder_.Add("processes/42/comm", "prober\n");
  EXPECT_EQ(obstacle("/dev/null"), PortObstacle::kInUse);
  EXPECT_EQ(DescribeComPort(sources_, 7).process_name, "prober");

  // Whether it is a terminal, by the drivers of those: /dev/null is device 1:3.
  fs::create_directories(folder_.Path("processes/tty"));
  for (const auto& [drivers, is_terminal] :
       {std::pair{"serial /dev/ttyS 4 64-111 serial\nmem /dev/x 1 4 serial\n", false},
        {"mem /dev/x 1 0-4 serial\n", true},
        {"mem /dev/x 1 3 serial\n", true}}) {
    folder_.Add("processes/tty/drivers", drivers);
    EXPECT_EQ(obstacle("/dev/null"), is_terminal ? PortObstacle::kInUse : PortObstacle::kNotFound) << drivers;
  }
}

// Another program, by its lock: on a pseudo terminal the simulating side has a descriptor, too.
TEST_F(PortListTest, OfAPseudoTerminalTheHolderOfTheLockIsTold) {
  std::string error;
  const auto terminal = OpenPseudoTerminal(error);
  ASSERT_TRUE(terminal) << error;
  sources_.variables = {{7, terminal->device_path()}};
  sources_.processes = "/proc";
  EXPECT_EQ(DescribeComPort(sources_, 7).obstacle, PortObstacle::kNone);
  struct stat status {};
  ASSERT_EQ(::stat(terminal->device_path().c_str(), &status), 0);
  std::array<char, 64> line{};
  std::snprintf(line.data(), line.size(), "7: FLOCK  ADVISORY  WRITE 42 %02x:%02x:%lu 0 EOF\n", major(status.st_dev),
                minor(status.st_dev), static_cast<unsigned long>(status.st_ino));
  fs::create_directories(folder_.Path("processes/42"));
  folder_.Add("processes/locks", line.data());
  folder_.Add("processes/42/comm", "prober\n");
  sources_.processes = folder_.Path("processes");
  const PortInfo info = DescribeComPort(sources_, 7);
  EXPECT_EQ(info.obstacle, PortObstacle::kInUse);
  EXPECT_EQ(info.process, 42u);
  EXPECT_EQ(info.process_name, "prober");
}

// Puts variables back as they were.
class Variables {
 public:
  explicit Variables(std::vector<std::pair<const char*, std::optional<std::string>>> values) {
    for (auto& [name, value] : values) {
      old_.emplace_back(name, EnvironmentValue(name));
      SetEnvironmentValue(name, value);
    }
  }
  ~Variables() {
    for (const auto& [name, value] : old_) SetEnvironmentValue(name, value);
  }

 private:
  std::vector<std::pair<const char*, std::optional<std::string>>> old_;
};

TEST(PortSourcesTest, TheEnvironmentNamesPortsAndFolders) {
  const Variables variables({{"KRAL_COM31", "/dev/x"},
                             {"KRAL_COM32", ""},
                             {"KRAL_COM033", "/dev/y"},
                             {"KRAL_COM256", "/dev/z"},
                             {"KRAL_PORT_DIR", "/ports"}});
  const PortSources sources = CurrentPortSources();
  EXPECT_EQ(sources.variables.count(31), 1u);
  for (const int number : {32, 33, 256}) EXPECT_EQ(sources.variables.count(number), 0u) << number;
  EXPECT_EQ(sources.link_folders, std::vector<fs::path>{"/ports"});
  EXPECT_EQ(ComPortDevice(31), "/dev/x");
}

TEST(PortSourcesTest, WithoutAChosenFolderTheUsersComesBeforeTheSystems) {
  const Variables variables({{"KRAL_PORT_DIR", std::nullopt}, {"XDG_CONFIG_HOME", "/c"}, {"HOME", "/h"}});
  EXPECT_EQ(CurrentPortSources().link_folders, (std::vector<fs::path>{"/c/kral/ports", "/etc/kral/ports"}));
  SetEnvironmentValue("XDG_CONFIG_HOME", std::nullopt);
  EXPECT_EQ(CurrentPortSources().link_folders, (std::vector<fs::path>{"/h/.config/kral/ports", "/etc/kral/ports"}));
}

}  // namespace
}  // namespace kral
