#include "tests/world.h"

#include <fcntl.h>
#include <sched.h>
#include <spawn.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <set>
#include <sstream>
#include <stdexcept>

#include "foundation/warning.h"

namespace fs = std::filesystem;

namespace kelvane {
namespace {

std::vector<std::string> lines_of(const std::string& text) {
  std::vector<std::string> lines;
  std::istringstream stream(text);
  for (std::string line; std::getline(stream >> std::ws, line);) lines.push_back(line);
  return lines;
}

std::string content(const std::string& file) {
  std::ifstream stream(file);
  return {std::istreambuf_iterator<char>(stream), {}};
}

}  // namespace

void world::SetUp() {
  if (const uid_t user = ::geteuid(); user != 0) {
    ASSERT_EQ(::unshare(CLONE_NEWUSER), 0) << "no unprivileged user namespaces";
    std::ofstream("/proc/self/uid_map") << "0 " << user << " 1";
  }
  root_ = fs::temp_directory_path() / "kelvane-test-XXXXXX";
  ASSERT_NE(::mkdtemp(root_.data()), nullptr);
  fs::copy(KELVANE_RUNTIME, root_, fs::copy_options::recursive);
  if (const std::string shared = KELVANE_SHARED_DIRECTORY; !shared.empty()) {
    // In a namespace of the test's own: the machine must not see the mount, nor keep it.
    ASSERT_EQ(::unshare(CLONE_NEWNS), 0);
    ASSERT_EQ(::mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr), 0);
    ASSERT_EQ(::mount(shared.c_str(), (root_ + shared).c_str(), nullptr, MS_REC | MS_BIND, nullptr),
              0);
  }
  outer_root_ = ::open("/", O_RDONLY | O_CLOEXEC);
  ASSERT_TRUE(::chroot(root_.c_str()) == 0 && ::chdir("/") == 0);
}

void world::TearDown() {
  ASSERT_TRUE(::fchdir(outer_root_) == 0 && ::chroot(".") == 0);
  ::umount2((root_ + KELVANE_SHARED_DIRECTORY).c_str(), MNT_DETACH);
  fs::remove_all(root_);
}

std::string world::system(const std::string& version, const std::string& schema) {
  return "/usr/share/zoneinfo.default/+VERSION = " + version + "\n" +
         "/usr/share/zoneinfo.default/Europe/Paris = TZif\n" +
         "/usr/share/icu/icutzformat.txt = " + schema + "\n";
}

std::string world::download(const std::string& version, const std::string& schema) {
  const std::string directory = "/var/db/timezone/tz/" + version;
  return directory + "/zoneinfo/Europe/Paris = TZif\n" +  //
         directory + "/icutz/icutz" + schema + ".dat = data\n";
}

void world::build(const std::string& entries) {
  for (const std::string& entry : lines_of(entries)) {
    const std::size_t file = entry.find(" = "), link = entry.find(" -> ");
    const fs::path path = entry.substr(0, std::min(file, link));
    fs::create_directories(path.parent_path());
    if (file != std::string::npos) std::ofstream(path) << entry.substr(file + 3);
    if (link == std::string::npos) continue;
    fs::remove(path);
    fs::create_symlink(entry.substr(link + 4), path);
  }
}

std::string world::listing(const std::string& top, const std::string& except) {
  std::set<std::string> entries;
  std::error_code absent;
  for (fs::recursive_directory_iterator at(top, absent), end; at != end; ++at) {
    const std::string path = at->path();
    if (path == except) at.disable_recursion_pending();
    else if (at->is_symlink()) entries.insert(path + " -> " + fs::read_symlink(path).string());
    else if (at->is_regular_file()) entries.insert(path + " = " + content(path));
    else if (fs::is_empty(path)) entries.insert(path + "/");
  }
  std::string result;
  for (const std::string& entry : entries) result += entry + "\n";
  return result;
}

std::string world::outcome(const std::function<void()>& operation) {
  const int saved = ::fcntl(STDERR_FILENO, F_DUPFD_CLOEXEC, 10);
  const int file = ::open("/stderr", O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
  EXPECT_TRUE(file != -1 && ::dup2(file, STDERR_FILENO) != -1);
  ::close(file);
  std::string thrown;
  try {
    operation();
  } catch (int error) {
    thrown = "int " + std::to_string(error) + "\n";
  } catch (const std::exception& error) {
    thrown = error.what() + std::string("\n");
  }
  ::dup2(saved, STDERR_FILENO);
  ::close(saved);
  std::string result;
  for (const std::string& line : lines_of(content("/stderr"))) {
    EXPECT_TRUE(line.starts_with("kelvane: ")) << line;
    result += line.substr(line.find(": ") + 2) + "\n";
  }
  return result + thrown;
}

void world::expect_text(const std::string& actual, const std::string& wanted) {
  std::vector<std::string> lines = lines_of(actual), wanted_lines = lines_of(wanted);
  std::sort(std::find_if(wanted_lines.begin(), wanted_lines.end(),
                         [](const std::string& line) { return line.starts_with("/"); }),
            wanted_lines.end());
  for (std::size_t i = 0; i < std::min(lines.size(), wanted_lines.size()); ++i) {
    const std::string& pattern = wanted_lines[i];
    if (pattern.ends_with(": *") && lines[i].starts_with(pattern.substr(0, pattern.size() - 1)))
      lines[i] = pattern;
  }
  EXPECT_EQ(lines, wanted_lines);
}

void world::expect_run(const std::string& before, const std::string& after, const char* file,
                       int line) {
  const testing::ScopedTrace trace(file, line, "this run");
  build(before);
  const std::string untouched = listing("/usr") + listing("/var/db/timezone/tz");
  char ignored[] = "--ignored";
#ifdef KELVANE_EMULATOR
  char emulator[] = KELVANE_EMULATOR, program[] = "/sbin/kelvane";
  const char* const executable = emulator;
  char* const arguments[] = {emulator, program, ignored, nullptr};
#else
  char name[] = "/sbin/any-name";
  const char* const executable = "/sbin/kelvane";
  char* const arguments[] = {name, ignored, nullptr};
#endif
  int status = -1;
  std::string actual = outcome([&] {
    pid_t child = -1;
    ::posix_spawn(&child, executable, nullptr, nullptr, arguments, environ);
    ::waitpid(child, &status, 0);
  });
  EXPECT_TRUE(WIFEXITED(status));
  if (status != 0) actual += "status " + std::to_string(WEXITSTATUS(status)) + "\n";
  expect_text(actual + listing("/var/db", "/var/db/timezone/tz"), after);
  EXPECT_EQ(listing("/usr") + listing("/var/db/timezone/tz"), untouched);
}

}  // namespace kelvane

int main(int argc, char** argv) {
  ::umask(022);
  testing::InitGoogleTest(&argc, argv);
  kelvane::prepare_warnings();
  return RUN_ALL_TESTS();
}
