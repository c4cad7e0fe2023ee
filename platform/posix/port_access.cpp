// The group of a device's file, and the latency timer that drivers of USB adapters show in sysfs.
#include "platform/port_access.h"

#include <grp.h>
#include <pwd.h>
#include <sys/stat.h>
#include <sys/utsname.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <charconv>
#include <filesystem>
#include <fstream>
#include <system_error>
#include <vector>

#include "platform/posix/port_sources.h"

namespace kral {
namespace {

namespace fs = std::filesystem;

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
  std::error_code error;
  const auto tty = fs::canonical(device, error).filename();
  const auto file = CurrentPortSources().tty_class / tty / "device" / "latency_timer";
  uint32_t milliseconds = 0;
  if (!error && std::ifstream(file) >> milliseconds) {
    access.latency_ms = milliseconds;
    access.latency_file = file.string();
  }
  return access;
}

uint32_t FindProcess(const std::string& name) {
  std::error_code error;
  fs::directory_iterator entry(CurrentPortSources().processes, error);
  if (error) return 0;
  for (const fs::directory_iterator end; !error && entry != end; entry.increment(error)) {
    const std::string folder = entry->path().filename().string();
    uint32_t id = 0;
    const auto [stop, problem] = std::from_chars(folder.data(), folder.data() + folder.size(), id);
    if (problem != std::errc() || stop != folder.data() + folder.size()) continue;
    std::ifstream stream(entry->path() / "comm");
    std::string running;
    if (std::getline(stream, running) && running == name) return id;
  }
  return 0;
}

std::string SystemName() {
  struct utsname names {};
  if (::uname(&names) != 0) return "unknown";
  return std::string(names.sysname) + " " + names.release;
}

}  // namespace kral
