// A device in a throw-away root directory, told as text: CONTRIBUTING.md explains the notation.

#ifndef KELVANE_TESTS_DEVICE_H_
#define KELVANE_TESTS_DEVICE_H_

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <functional>
#include <regex>
#include <set>
#include <sstream>

namespace kelvane {

namespace fs = std::filesystem;

struct throw_away_root : testing::Environment {
  void SetUp() override {
    ASSERT_TRUE(::chroot(KELVANE_ROOT) == 0 && ::chdir("/") == 0)
        << "be root, or start this by: unshare --map-root-user";
    ::umask(062);  // Data count if others may read them; the group need not.
    fs::create_directories("/locale/xx");
    ::mkfifo("/locale/xx/LC_IDENTIFICATION", 0600);
  }
};
inline const auto* const root = testing::AddGlobalTestEnvironment(new throw_away_root);

// What each device has unless it says otherwise: links with which nothing is wrong, and data.
inline const std::string usual = R"(
    /usr/share/version = 2022a
    /usr/share/zoneinfo.default/+VERSION -> ../version
    /usr/share/zoneinfo.default/Europe/Paris = data
    /usr/share/icu/icutzformat.txt = 44l and more
    /usr/share/icu/icutz9l.dat = does not count
    ~/tz/2022b/icutz -> ../2023c.1.0/icutz
    ~/tz/2022unfit/icutz/icutz044l.dat = data
    ~/tz/2026unfit/icutz/icutz044l.dat = data
    ~/tz/2023c.1.0/icutz/icutz44l.dat = data
    ~/tz/2023c.1.0/icutz/icutzformat.txt = does not count
    ~/tz/2023c.1.0/zoneinfo/+VERSION = 2030a
    ~/zoneinfo -> /usr/share/zoneinfo.default
    ~/localtime -> ~/zoneinfo/Europe/Paris
    ~/TZVersionDiffRecord = longer than what is written now
)";

// The entries by which a release, or the "system" partition, is in use.
inline std::string links_to(const std::string& version) {
  if (version == "system") return "~/zoneinfo -> /usr/share/zoneinfo.default\n no ~/icutz\n";
  return "~/zoneinfo -> ~/tz/" + version + "/zoneinfo\n ~/icutz -> ~/tz/" + version + "/icutz\n";
}

inline std::string content(const std::string& file) {
  std::ostringstream text;
  text << std::ifstream(file).rdbuf();
  return text.str();
}

// Makes a device of these entries alone; a line takes the place of earlier ones at its path.
inline void build(const std::string& entries) {
  for (const char* const top : {"/usr/share", "/var"}) fs::remove_all(top);
  for (const char* const top : {"/usr/share", "/var/db"}) fs::create_directories(top);
  std::istringstream lines(std::regex_replace(entries, std::regex("~"), "/var/db/timezone"));
  for (std::string line; std::getline(lines >> std::ws, line);) {
    if (line[0] == '#') continue;
    std::smatch part;
    const std::regex form("(no (?=[^ ]*$))?([^ ]*[^ /|])( = | -> |[/|]?$)(.*)");
    ASSERT_TRUE(std::regex_match(line, part, form)) << line;
    const fs::path path = part.str(2);
    fs::remove_all(path);
    if (part[1].matched) continue;
    fs::create_directories(part[3] == "/" ? path : path.parent_path());
    if (part[3] == " = ") std::ofstream(path) << part[4];
    if (part[3] == " -> ") fs::create_symlink(part.str(4), path);
    if (part[3] == "|") ::mkfifo(path.c_str(), 0644);
    if (part[4] == "secret") fs::permissions(path, fs::perms(0660));
  }
}

// The entries of the device, in order.
inline std::string listing() {
  std::set<std::string> entries;
  for (const char* const top : {"/usr/share", "/var"}) {
    for (const fs::directory_entry& entry : fs::recursive_directory_iterator(top)) {
      const std::string path = entry.path();
      if (entry.is_symlink()) entries.insert(path + " -> " + fs::read_symlink(path).string());
      else if (entry.is_regular_file()) entries.insert(path + " = " + content(path));
      else if (entry.is_fifo()) entries.insert(path + "|");
      else if (fs::is_empty(path)) entries.insert(path + "/");
    }
  }
  std::string result;
  for (const std::string& entry : entries) result += entry + "\n";
  return std::regex_replace(result, std::regex("/var/db/timezone"), "~");
}

// Starts the device, after `prepare` in the program's process: what that says, and its status.
inline std::string start(const std::function<void()>& prepare = [] {}) {
  if (::fork() == 0) {
    ::dup2(::open("/said", O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644), STDERR_FILENO);
    ::alarm(20);  // Ends a run that hangs, with status 142.
    ::setenv("LC_ALL", "xx", 1);
    ::setenv("LOCPATH", "/locale", 1);  // Where the locale xx is a pipe: who asks for it hangs.
    prepare();
    ::execl("/sbin/emulator", "emulator", "/sbin/kelvane", nullptr);  // Of another machine.
    ::execl("/sbin/kelvane", "any-name", "--version", "-n", nullptr);
    std::abort();
  }
  int status = 0;
  ::wait(&status);
  std::string told;
  std::istringstream lines(content("/said"));
  for (std::string line; std::getline(lines, line);) {
    line.erase(0, line.starts_with("kelvane: ") ? 9 : 0);
    // Without the error text and, since an editor may take it away, a blank before it.
    line.erase(line.find_last_not_of(' ', line.rfind(": ") - 1) + 1);
    told += "| " + std::regex_replace(line, std::regex("/var/db/timezone"), "~") + "\n";
  }
  const int code = WIFSIGNALED(status) ? 128 + WTERMSIG(status) : WEXITSTATUS(status);
  return told + (code == 0 ? "" : "| status " + std::to_string(code) + "\n");
}

}  // namespace kelvane

#endif  // KELVANE_TESTS_DEVICE_H_
