#include "tests/device.h"

#include <fcntl.h>
#include <poll.h>
#include <sched.h>
#include <seccomp.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <future>
#include <regex>
#include <set>
#include <sstream>
#include <stdexcept>
#include <thread>

#include "foundation/warning.h"

namespace fs = std::filesystem;

namespace kelvane {
namespace {

std::vector<std::string> lines_of(const std::string& text) {
  std::vector<std::string> lines;
  std::istringstream stream(std::regex_replace(text, std::regex("~"), "/var/db/timezone"));
  for (std::string line; std::getline(stream >> std::ws, line);) lines.push_back(line);
  return lines;
}

// Does `start` in a thread whose calls, and those of the program that it starts, the kernel holds
// until they are answered here. All go on but those that `watch` lets fail; it is asked about the
// program's, from where main() ignores SIGPIPE. Nothing else may allocate: the thread may hold the
// lock.
void watch_calls(const std::function<int(const std::string&)>& watch,
                 const std::function<void()>& start) {
  const int sigaction = seccomp_syscall_resolve_name("rt_sigaction");
  const scmp_filter_ctx filter = seccomp_init(SCMP_ACT_NOTIFY);
  // The C library aborts where these fail.
  for (const char* name : {"execve", "exit", "exit_group", "futex"})
    seccomp_rule_add(filter, SCMP_ACT_ALLOW, seccomp_syscall_resolve_name(name), 0);
  seccomp_notif* call = nullptr;
  seccomp_notif_resp* answer = nullptr;
  ASSERT_EQ(seccomp_notify_alloc(&call, &answer), 0);
  std::promise<int> loaded;
  std::thread starter([&] {
    loaded.set_value(seccomp_load(filter) == 0 ? seccomp_notify_fd(filter) : -1);
    start();
  });
  pollfd listener = {loaded.get_future().get(), POLLIN, 0};
  __u32 program = 0;
  while (listener.fd != -1 && ::poll(&listener, 1, -1) == 1 && listener.revents == POLLIN) {
    *call = {};  // The kernel asks for zeros.
    if (seccomp_notify_receive(listener.fd, call) != 0) continue;
    if (call->data.nr == sigaction && call->data.args[0] == SIGPIPE) program = call->pid;
    *answer = {call->id, 0, 0, SECCOMP_USER_NOTIF_FLAG_CONTINUE};
    if (call->pid == program) {
      char* const name = seccomp_syscall_resolve_num_arch(call->data.arch, call->data.nr);
      if (const int error = watch(name); error != 0) *answer = {call->id, 0, -error, 0};
      // A brk that fails gives the end of the heap as it is, and no error number; 0 will do.
      if (answer->error != 0 && name == std::string("brk")) answer->error = 0;
      std::free(name);
    }
    seccomp_notify_respond(listener.fd, answer);
  }
  starter.join();
  EXPECT_NE(listener.fd, -1);
  seccomp_notify_free(call, answer);
  seccomp_release(filter);
  // Closes the listener, without which the library would not ask for another.
  seccomp_reset(nullptr, 0);
}

}  // namespace

void device::SetUp() {
  prepare_warnings();
  ::umask(022);
  if (const uid_t user = ::geteuid(); user != 0) {
    ASSERT_EQ(::unshare(CLONE_NEWUSER), 0) << "no unprivileged user namespaces";
    std::ofstream("/proc/self/uid_map") << "0 " << user << " 1";
  }
  // Below the build directory, where programs may run.
  root_ = KELVANE_RUNTIME "-XXXXXX";
  ASSERT_NE(::mkdtemp(root_.data()), nullptr);
  fs::copy(KELVANE_RUNTIME, root_,
           fs::copy_options::recursive | fs::copy_options::create_hard_links);
  if (const std::string shared = KELVANE_SHARED_DIRECTORY, inside = root_ + shared; shared != "") {
    // In a namespace of the test's own: the machine must not see the mount, nor keep it.
    ASSERT_EQ(::unshare(CLONE_NEWNS), 0);
    ASSERT_EQ(::mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr), 0);
    ASSERT_EQ(::mount(shared.c_str(), inside.c_str(), nullptr, MS_REC | MS_BIND, nullptr), 0);
  }
  outer_root_ = ::open("/", O_RDONLY | O_CLOEXEC);
  ASSERT_TRUE(::chroot(root_.c_str()) == 0 && ::chdir("/") == 0);
}

void device::TearDown() {
  ASSERT_TRUE(::fchdir(outer_root_) == 0 && ::chroot(".") == 0);
  ::umount2((root_ + KELVANE_SHARED_DIRECTORY).c_str(), MNT_DETACH);
  fs::remove_all(root_);
}

std::string device::system(const std::string& version, const std::string& schema) {
  return "/usr/share/zoneinfo.default/+VERSION = " + version + "\n" +
         "/usr/share/zoneinfo.default/Europe/Paris = TZif\n" +
         "/usr/share/icu/icutzformat.txt = " + schema + "\n";
}

std::string device::download(const std::string& version, const std::string& schema) {
  return "~/tz/" + version + "/zoneinfo/Europe/Paris = TZif\n" +  //
         "~/tz/" + version + "/icutz/icutz" + schema + ".dat = data\n";
}

std::string device::on(const std::string& version) {
  return "~/zoneinfo -> ~/tz/" + version + "/zoneinfo\n~/icutz -> ~/tz/" + version + "/icutz\n";
}

void device::build(const std::string& entries) {
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

std::string device::listing(const std::string& top, const std::string& except) {
  std::set<std::string> entries;
  for (fs::recursive_directory_iterator at(top), end; at != end; ++at) {
    const std::string path = at->path();
    std::ifstream content(path);
    if (path == except) at.disable_recursion_pending();
    else if (at->is_symlink()) entries.insert(path + " -> " + fs::read_symlink(path).string());
    else if (at->is_regular_file())
      entries.insert(path + " = " + std::string(std::istreambuf_iterator<char>(content), {}));
    else if (fs::is_empty(path)) entries.insert(path + "/");
  }
  std::string result;
  for (const std::string& entry : entries) result += entry + "\n";
  return result;
}

void device::build_store(const std::string& entries) {
  for (const fs::path top : {"/var/db/timezone", "/var/db"}) {
    for (const fs::path& path : fs::directory_iterator(top))
      if (path.filename() != "tz" && path.filename() != "timezone") fs::remove_all(path);
  }
  build(entries);
}

std::string device::outcome(const action& operation) {
  const int saved = ::fcntl(STDERR_FILENO, F_DUPFD_CLOEXEC, 10);
  ::close(STDERR_FILENO);
  EXPECT_EQ(::open("/stderr", O_RDWR | O_CREAT | O_TRUNC, 0600), STDERR_FILENO);
  std::string thrown, result, line;
  int error = 0;
  try {
    operation();
  } catch (int number) {
    error = number;
    thrown = "int " + std::to_string(number) + "\n";
  } catch (const std::invalid_argument& exception) {
    thrown = std::string("invalid_argument ") + exception.what() + "\n";
  } catch (const std::out_of_range&) {
    thrown = "out_of_range\n";
  }
  ::dup2(saved, STDERR_FILENO);
  ::close(saved);
  for (std::ifstream lines("/stderr"); std::getline(lines, line);) {
    EXPECT_TRUE(line.starts_with("kelvane: ")) << line;
    result += line.substr(9, line.rfind(": ") - 9) + "\n";
    // The last warning before an error number is thrown is about that error.
    const bool last = lines.peek() == EOF && error > 0;
    EXPECT_TRUE(!last || line.ends_with(std::string(": ") + std::strerror(error))) << line;
  }
  return result + thrown;
}

std::string device::boot(const watcher& watch, const action& prepare) {
  int status = -1;
  const auto data = [] { return listing("/usr") + listing("/var/db/timezone/tz"); };
  const auto start = [&] {
    const pid_t program = ::fork();
    if (program == 0) {
      // A sanitizer's own calls at the end of a run fail as well.
      if (watch) ::setenv("ASAN_OPTIONS", "abort_on_error=1:detect_leaks=0", 1);
      if (prepare) prepare();
      ::execl("/sbin/kelvane", "any-name", "--ignored", nullptr);
      ::_exit(127);
    }
    ::waitpid(program, &status, 0);
  };
  const std::string before = data();
  std::string said = outcome([&] { watch ? watch_calls(watch, start) : start(); });
  EXPECT_EQ(data(), before);
  if (WIFSIGNALED(status)) said += "signal " + std::to_string(WTERMSIG(status)) + "\n";
  else if (status != 0) said += "status " + std::to_string(WEXITSTATUS(status)) + "\n";
  return said + store();
}

std::string device::text(const std::string& lines) {
  std::vector<std::string> sorted = lines_of(lines);
  std::sort(std::find_if(sorted.begin(), sorted.end(), [](auto& line) { return line[0] == '/'; }),
            sorted.end());
  std::string result;
  for (const std::string& line : sorted) result += line + "\n";
  return result;
}

}  // namespace kelvane
