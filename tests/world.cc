#include "tests/world.h"

#include <fcntl.h>
#include <sched.h>
#include <sys/mman.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <set>
#include <sstream>
#include <stdexcept>
#include <vector>

namespace fs = std::filesystem;

namespace kelvane {
namespace {

int outer_root = -1;
int program = -1;

std::vector<std::string> lines_of(const std::string& text) {
  std::vector<std::string> lines;
  std::istringstream stream(text);
  for (std::string line; std::getline(stream >> std::ws, line);) lines.push_back(line);
  return lines;
}

int run_program() {
  const pid_t child = ::fork();
  if (child == 0) {
    char name[] = "/sbin/any-name", ignored[] = "--ignored";
    char* const arguments[] = {name, ignored, nullptr};
    ::fexecve(program, arguments, environ);
    ::_exit(127);
  }
  int status = -1;
  ::waitpid(child, &status, 0);
  return status;
}

}  // namespace

void world::SetUp() {
  char name[] = "/tmp/kelvane-test-XXXXXX";
  ASSERT_NE(::mkdtemp(name), nullptr);
  root_ = name;
  fs::copy(KELVANE_RUNTIME, root_, fs::copy_options::recursive);
  ASSERT_TRUE(::chroot(name) == 0 && ::chdir("/") == 0);
}

void world::TearDown() {
  ASSERT_TRUE(::fchdir(outer_root) == 0 && ::chroot(".") == 0);
  fs::remove_all(root_);
}

std::string world::system(const std::string& version, const std::string& schema) {
  return "/usr/share/zoneinfo.default/+VERSION = " + version +
         "\n/usr/share/icu/icutzformat.txt = " + schema + "\n";
}

std::string world::download(const std::string& version, const std::string& schema) {
  const std::string directory = "/var/db/timezone/tz/" + version;
  return directory + "/zoneinfo/Europe/Paris = TZif\n" +  //
         directory + "/icutz/icutz" + schema + ".dat = data\n";
}

void world::build(const std::string& entries) {
  for (const std::string& entry : lines_of(entries)) {
    const std::size_t file = entry.find(" = ");
    const std::size_t link = entry.find(" -> ");
    const fs::path path = entry.substr(0, std::min(file, link));
    fs::create_directories(path.parent_path());
    if (file != std::string::npos) std::ofstream(path) << entry.substr(file + 3);
    if (link != std::string::npos) fs::create_symlink(entry.substr(link + 4), path);
  }
}

std::string world::listing(const std::string& top, const std::string& except) {
  std::set<std::string> entries;
  std::error_code absent;
  for (fs::recursive_directory_iterator at(top, absent), end; at != end; ++at) {
    const std::string path = at->path();
    std::ostringstream content;
    if (path == except) {
      at.disable_recursion_pending();
    } else if (at->is_symlink()) {
      entries.insert(path + " -> " + fs::read_symlink(path).string() + "\n");
    } else if (at->is_regular_file()) {
      content << path << " = " << std::ifstream(path).rdbuf();
      entries.insert(content.str() + "\n");
    } else if (fs::is_empty(path)) {
      entries.insert(path + "/\n");
    }
  }
  std::string result;
  for (const std::string& entry : entries) result += entry;
  return result;
}

std::string world::outcome(const std::function<void()>& operation) {
  const int saved = ::fcntl(STDERR_FILENO, F_DUPFD_CLOEXEC, 10);
  const int file = ::memfd_create("stderr", MFD_CLOEXEC);
  ::dup2(file, STDERR_FILENO);
  std::string thrown;
  try {
    operation();
  } catch (int error) {
    thrown = "int " + std::to_string(error) + "\n";
  } catch (const std::invalid_argument& error) {
    thrown = std::string("invalid_argument ") + error.what() + "\n";
  } catch (const std::out_of_range&) {
    thrown = "out_of_range\n";
  }
  ::dup2(saved, STDERR_FILENO);
  std::string written(static_cast<std::size_t>(::lseek(file, 0, SEEK_END)), '\0');
  EXPECT_EQ(::pread(file, written.data(), written.size(), 0), ::lseek(file, 0, SEEK_END));
  ::close(saved);
  ::close(file);
  std::string result;
  const std::string name = "kelvane: ";
  for (const std::string& line : lines_of(written)) {
    EXPECT_TRUE(line.starts_with(name)) << line;
    result += line.substr(name.size()) + "\n";
  }
  return result + thrown;
}

void world::expect_text(const std::string& actual, const std::string& wanted) {
  std::vector<std::string> actual_lines = lines_of(actual);
  const std::vector<std::string> wanted_lines = lines_of(wanted);
  for (std::size_t i = 0; i < std::min(actual_lines.size(), wanted_lines.size()); ++i) {
    std::string& line = actual_lines[i];
    if (wanted_lines[i].ends_with(": *")) line.replace(line.rfind(": "), std::string::npos, ": *");
  }
  EXPECT_EQ(actual_lines, wanted_lines);
}

void world::expect_run(const std::string& before, const std::string& after,
                       std::source_location where) {
  const testing::ScopedTrace trace(where.file_name(), static_cast<int>(where.line()), "this run");
  build(before);
  const std::string data = listing("/usr") + listing("/var/db/timezone/tz");
  int status = -1;
  std::string actual = outcome([&] { status = run_program(); });
  EXPECT_TRUE(WIFEXITED(status));
  if (status != 0) actual += "status " + std::to_string(WEXITSTATUS(status)) + "\n";
  expect_text(actual + listing("/var/db", "/var/db/timezone/tz"), after);
  EXPECT_EQ(listing("/usr") + listing("/var/db/timezone/tz"), data);
}

}  // namespace kelvane

int main(int argc, char** argv) {
  testing::InitGoogleTest(&argc, argv);
  kelvane::program = ::open(KELVANE_PROGRAM, O_RDONLY | O_CLOEXEC);
  kelvane::outer_root = ::open("/", O_RDONLY | O_CLOEXEC);
  if (const uid_t user = ::geteuid(); user != 0) {
    if (::unshare(CLONE_NEWUSER) != 0) throw std::runtime_error("no unprivileged user namespaces");
    std::ofstream("/proc/self/uid_map") << "0 " << user << " 1";
  }
  program_invocation_short_name = ::strdup("kelvane");
  return RUN_ALL_TESTS();
}
