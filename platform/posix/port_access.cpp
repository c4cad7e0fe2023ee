// The group of a device's file, and the latency timer that drivers of USB adapters show in sysfs.
#include "platform/port_access.h"

#include <grp.h>
#include <pwd.h>
#include <sys/stat.h>
#include <sys/utsname.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <vector>

#include "platform/posix/port_sources.h"
#include "platform/posix/system_files.h"

namespace kral {
namespace {

bool IsMember(gid_t group) {
  const int count = ::getgroups(0, nullptr);
  std::vector<gid_t> groups(static_cast<size_t>(std::max(count, 0)));
  if (::getgroups(count, groups.data()) < 0) groups.clear();
  return ::getegid() == group || std::ranges::find(groups, group) != groups.end();
}

void DescribeGroup(gid_t id, PortAccess& access) {
  std::array<char, 16384> room{};
  struct group entry {};
  struct group* found = nullptr;
  if (::getgrgid_r(id, &entry, room.data(), room.size(), &found) != 0 || found == nullptr) return;
  access.group = entry.gr_name;
  access.is_member = IsMember(id);
  std::array<char, 16384> user_room{};
  struct passwd user {};
  struct passwd* found_user = nullptr;
  if (::getpwuid_r(::getuid(), &user, user_room.data(), user_room.size(), &found_user) != 0 || found_user == nullptr) {
    return;
  }
  for (char** member = entry.gr_mem; *member != nullptr; ++member) {
    if (std::string(*member) == user.pw_name) access.is_listed = true;
  }
}

}  // namespace

PortAccess DescribePortAccess(const std::string& device) {
  PortAccess access;
  struct stat status {};
  if (::stat(device.c_str(), &status) != 0) return access;
  if ((status.st_mode & (S_IRGRP | S_IWGRP)) == (S_IRGRP | S_IWGRP)) DescribeGroup(status.st_gid, access);
  const auto tty = RealPath(device);
  if (!tty) return access;
  const auto file = CurrentPortSources().tty_class / tty->filename() / "device" / "latency_timer";
  if (const auto milliseconds = NumberIn<uint32_t>(FirstLineOf(file))) {
    access.latency_ms = *milliseconds;
    access.latency_file = file.string();
  }
  return access;
}

uint32_t FindProcess(const std::string& name) {
  const auto processes = CurrentPortSources().processes;
  for (const std::string& folder : NamesIn(processes).value_or(std::vector<std::string>())) {
    const auto id = NumberIn<uint32_t>(folder);
    if (id && FirstLineOf(processes / folder / "comm") == name) return *id;
  }
  return 0;
}

std::string SystemName() {
  struct utsname names {};
  if (::uname(&names) != 0) return "unknown";
  return std::string(names.sysname) + " " + names.release;
}

}  // namespace kral
