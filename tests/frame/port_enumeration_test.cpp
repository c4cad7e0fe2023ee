// Listing ports, asking which of them have a handset, and connecting to the first that answers.
#include "kral/connection.h"
#include "tests/support/handset_ports.h"
#include "tests/support/scripted_server.h"
#include "tests/support/test.h"

namespace kral {
namespace {

constexpr uint16_t kRoom = 4;

// What a listing call gave: its result, the count, and the entries that it wrote.
struct Listed {
  uint8_t result;
  uint16_t count;
  std::vector<uint16_t> ports;
  bool operator==(const Listed&) const = default;
};

std::ostream& operator<<(std::ostream& out, const Listed& listed) {
  out << int{listed.result} << ", " << listed.count << ":";
  for (const uint16_t port : listed.ports) out << ' ' << port;
  return out;
}

template <class Call>
Listed List(uint16_t room, Call call) {
  std::vector<uint16_t> ports(kRoom + 1, 0xFFFF);
  uint16_t count = room;
  const uint8_t result = call(&count, ports.data());
  const auto end = std::ranges::find(ports, 0xFFFF);
  return {result, count, {ports.begin(), end}};
}

Listed AllPorts(uint16_t room = kRoom) {
  return List(room, [](uint16_t* count, uint16_t* ports) { return KRAL_GetAllPortList(count, ports); });
}

Listed PhonePorts(uint16_t room = kRoom, std::vector<uint16_t> ignored = {}) {
  return List(room, [&](uint16_t* count, uint16_t* ports) {
    return KRAL_GetAvailablePhonesPortList(count, ports, static_cast<uint16_t>(ignored.size()), ignored.data());
  });
}

// Handsets on 7, 5 and 9, in this order; nothing answers on 3 (cannot be opened) and on 5 (silent).
class PortEnumeration : public testing::Test {
 protected:
  PortEnumeration() {
    ports_.AddDead(3);
    ports_.Add(7);
    ports_.Add(5).faults().Add(handset::Ignore(), handset::When::Always());
    ports_.Add(9);
  }
  test::HandsetPorts ports_;
};

TEST_F(PortEnumeration, ListsPortsInOrderWithoutOpeningAny) {
  EXPECT_EQ(AllPorts(), (Listed{1, 4, {3, 7, 5, 9}}));
  EXPECT_EQ(AllPorts(2), (Listed{1, 2, {3, 7}}));
  EXPECT_EQ(AllPorts(0), (Listed{1, 0, {}}));
  EXPECT_TRUE(ports_.opens().empty());
}

TEST_F(PortEnumeration, FailsWhenThePortsCannotBeListed) {
  ports_.SetCanList(false);
  EXPECT_EQ(AllPorts(), (Listed{0, 0, {}}));
  EXPECT_EQ(PhonePorts(), (Listed{0, kRoom, {}})) << "the count stays as it was";
  EXPECT_EQ(KRAL_ConnectServer(KRAL_PORT_ANY), 0u);
}

TEST_F(PortEnumeration, FindsTheHandsetsThatAnswerUntilTheRoomIsFullAndLeavesIgnoredPortsAlone) {
  const struct {
    uint16_t room;
    std::vector<uint16_t> ignored;
    Listed listed;
    std::set<uint16_t> tried;
  } kRows[] = {{kRoom, {}, {1, 2, {7, 9}}, {3, 5, 7, 9}},
               {1, {}, {1, 1, {7}}, {3, 7}},
               {kRoom, {7, 3, 5}, {1, 1, {9}}, {9}},
               {kRoom, {7, 9}, {1, 0, {}}, {3, 5}}};
  for (const auto& row : kRows) {
    const size_t before = ports_.opens().size();
    EXPECT_EQ(PhonePorts(row.room, row.ignored), row.listed);
    const auto opens = ports_.opens();
    EXPECT_EQ(std::set<uint16_t>(opens.begin() + static_cast<std::ptrdiff_t>(before), opens.end()), row.tried);
    EXPECT_TRUE(ports_.open().empty());
  }
}

TEST_F(PortEnumeration, ClosesEveryConnectionFirst) {
  const KRAL_HANDLE handle = KRAL_ConnectServer(7);
  EXPECT_EQ(KRAL_IsPhoneConnected(handle), 1);
  EXPECT_EQ(PhonePorts(), (Listed{1, 2, {7, 9}}));
  EXPECT_EQ(KRAL_IsPhoneConnected(handle), 0);
}

TEST_F(PortEnumeration, AnyPortIsTheFirstThatAnswers) {
  const KRAL_HANDLE handle = KRAL_ConnectServer(KRAL_PORT_ANY);
  uint16_t port = 0;
  EXPECT_EQ(KRAL_GetComPortNumber(handle, &port), 1);
  EXPECT_EQ(port, 7);
  EXPECT_EQ(KRAL_IsPhoneConnected(handle), 1);
}

TEST(PortEnumerationWithoutHandset, AnyPortGivesZero) {
  test::HandsetPorts ports;
  ports.AddDead(3);
  EXPECT_EQ(KRAL_ConnectServer(KRAL_PORT_ANY), 0u);
}

TEST_F(PortEnumeration, NullPointersGiveZero) {
  uint16_t count = 4;
  EXPECT_EQ(KRAL_GetAllPortList(nullptr, nullptr), 0);
  EXPECT_EQ(KRAL_GetAllPortList(&count, nullptr), 0);
  EXPECT_EQ(KRAL_GetAvailablePhonesPortList(&count, nullptr, 0, nullptr), 0);
  EXPECT_EQ(count, 4);
  EXPECT_EQ(List(kRoom, [](uint16_t* c, uint16_t* p) { return KRAL_GetAvailablePhonesPortList(c, p, 9, nullptr); }),
            (Listed{1, 2, {7, 9}}));
}

TEST(ServerPortEnumeration, GivesTheNumbersBehindThePrefix) {
  test::ScriptedServer server;
  server.all_ports = {"COM3", "COM12", "COMX", "C", "COM255"};
  server.phone_ports = {"COM12"};
  EXPECT_EQ(AllPorts(), (Listed{1, 4, {3, 12, 0, 0}}));
  EXPECT_EQ(PhonePorts(kRoom, {12}), (Listed{1, 1, {12}})) << "the ignore list is not consulted";
  EXPECT_EQ(PhonePorts(0), (Listed{1, 0, {}})) << "true because the server's list is not empty";
  EXPECT_EQ(server.TakeCalls(), std::vector<std::string>{"make KRAL-PortInfo"});
  KRAL_DisconnectAllServers();
  EXPECT_EQ(server.TakeCalls(), std::vector<std::string>{"end KRAL-PortInfo"});
}

TEST(ServerPortEnumeration, FailsOnAnEmptyListAndWithoutServer) {
  {
    test::ScriptedServer server;
    EXPECT_EQ(AllPorts(), (Listed{0, 0, {}}));
    EXPECT_EQ(PhonePorts(), (Listed{0, 0, {}}));
  }
  KRAL_SetLibraryMode(1);
  EXPECT_EQ(AllPorts(), (Listed{0, 0, {}}));
  KRAL_SetLibraryMode(0);
}

}  // namespace
}  // namespace kral
