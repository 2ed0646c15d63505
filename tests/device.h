// A device in a throw-away root directory, described and compared as text.
//
// One entry a line, blanks before it ignored, "~" for /var/db/timezone:
//   ~/a/directory/
//   ~/a/file = its content
//   ~/a/link -> its target

#ifndef KELVANE_TESTS_DEVICE_H_
#define KELVANE_TESTS_DEVICE_H_

#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#ifdef KELVANE_SECCOMP
#include <seccomp.h>
#endif
#include <sys/wait.h>

#include <csignal>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <functional>
#include <future>
#include <map>
#include <regex>
#include <sstream>
#include <thread>

#include "foundation/warning.h"

namespace kelvane {

namespace fs = std::filesystem;
using action = std::function<void()>;
// Decides about each system call of a run, by its name: 0 lets it go on, an error number fail.
using watcher = std::function<int(const std::string& call)>;

class device : public testing::Test {
 protected:
  // Enters the root, as an ordinary user in a user namespace.
  void SetUp() override {
    static const bool entered = [user = ::geteuid(), group = ::getegid()] {
      if (user != 0 && ::unshare(CLONE_NEWUSER) == 0) {
        std::ofstream("/proc/self/uid_map") << "0 " << user << " 1";
        std::ofstream("/proc/self/setgroups") << "deny";
        std::ofstream("/proc/self/gid_map") << "0 " << group << " 1";
      }
      ::umask(020);  // Unlike any mode that a program would ask for.
      prepare_warnings();
      return ::chroot(KELVANE_ROOT) == 0 && ::chdir("/") == 0;
    }();
    ASSERT_TRUE(entered) << "chroot is not allowed here, nor in a user namespace";
  }

  static std::vector<std::string> lines_of(std::string text) {
    for (std::size_t at; (at = text.find('~')) != std::string::npos;)
      text.replace(at, 1, "/var/db/timezone");
    std::vector<std::string> lines;
    std::istringstream stream(text);
    for (std::string line; std::getline(stream >> std::ws, line);) lines.push_back(line);
    return lines;
  }

  // The messages, then the entries in order: the last of each path, unless "- PATH" follows.
  static std::string text(const std::string& lines) {
    std::string result;
    std::map<std::string, std::string> entries;
    for (const std::string& line : lines_of(lines)) {
      if (line[0] == '/') entries[line.substr(0, line.find(' '))] = line + "\n";
      else if (line[0] == '-') entries.erase(line.substr(2));
      else result += line + "\n";
    }
    for (const auto& [path, entry] : entries) result += entry;
    return result;
  }

  // Makes a device of these entries alone.
  static void build(const std::string& entries) {
    for (const char* top : {"/usr/share", "/var", "/s"}) fs::remove_all(top);
    for (const std::string& entry : lines_of(text("/var/db/\n" + entries))) {
      const std::size_t file = entry.find(" = "), link = entry.find(" -> ");
      const fs::path path = entry.substr(0, std::min(file, link));
      fs::create_directories(path.parent_path());
      if (file != std::string::npos) std::ofstream(path) << entry.substr(file + 3);
      if (link != std::string::npos) fs::create_symlink(entry.substr(link + 4), path);
    }
  }

  // What the device holds.
  static std::string listing() {
    std::string entries;
    std::error_code absent;
    for (const char* top : {"/usr/share", "/var", "/s"}) {
      for (const fs::directory_entry& at : fs::recursive_directory_iterator(top, absent)) {
        const std::string path = at.path();
        if (at.is_symlink()) entries += path + " -> " + fs::read_symlink(path).string() + "\n";
        else if (at.is_regular_file()) entries += path + " = " + content(path) + "\n";
        else if (at.is_directory() && fs::is_empty(path)) entries += path + "/\n";
      }
    }
    return text(entries);
  }
  static std::string content(const std::string& file) {
    return {std::istreambuf_iterator<char>(std::ifstream(file).rdbuf()), {}};
  }

  // What an operation wrote on standard error, without the program's name and the error text of
  // each line, then what it threw.
  static std::string outcome(const action& operation) {
    const int saved = ::fcntl(STDERR_FILENO, F_DUPFD_CLOEXEC, 10);
    ::close(STDERR_FILENO);
    EXPECT_EQ(::open("/stderr", O_RDWR | O_CREAT | O_TRUNC, 0600), STDERR_FILENO);
    std::string result, thrown;
    try {
      operation();
    } catch (int error) {
      // The last warning is about this error.
      EXPECT_TRUE(error == -1 ||
                  content("/stderr").ends_with(std::strerror(error) + std::string("\n")));
      thrown = "int " + std::to_string(error) + "\n";
    } catch (const std::logic_error& error) {
      thrown = typeid(error).name() + std::string(" ") + error.what() + "\n";
    }
    ::dup2(saved, STDERR_FILENO);
    ::close(saved);
    // What follows a call that failed is about the same error.
    const std::regex call_failed("^kelvane: (remove|read_symlink|create_symlink): ");
    std::string error_text;
    for (const std::string& line : lines_of(content("/stderr"))) {
      if (line.starts_with("LLVM Profile")) continue;  // What counts coverage had a call fail.
      EXPECT_TRUE(line.starts_with("kelvane: ") && line.ends_with(error_text)) << line;
      result += line.substr(9, line.rfind(": ") - 9) + "\n";
      error_text = std::regex_search(line, call_failed) ? line.substr(line.rfind(": ")) : "";
    }
    return result + thrown;
  }

  // What is said of a text that is no version.
  static std::string no_version(const std::string& text) {
    const std::string warning = "Cannot parse version string " + text;
    return warning + ", results.size() = 0\n" + warning + "\n";
  }

  // Runs the program, after `prepare` in the new process: its outcome, "status N" or "signal N"
  // where it did not exit with 0, and what the device then holds.
  static std::string boot(const watcher& watch = {}, const action& prepare = {}) {
    int status = -1;
    const auto start = [&] {
      const pid_t program = ::fork();
      if (program == 0) {
        // A sanitizer's own calls at the end of a run fail as well.
        if (watch) ::setenv("ASAN_OPTIONS", "abort_on_error=1:detect_leaks=0", 1);
        if (prepare) prepare();
        ::execl("/sbin/emulator", "emulator", "/sbin/kelvane", nullptr);  // Of another machine.
        ::execl("/sbin/kelvane", "any-name", "-n", "--version", nullptr);
        ::_exit(127);
      }
      ::waitpid(program, &status, 0);
    };
    std::string result = outcome([&] { watch ? watch_calls(watch, start) : start(); });
    if (WIFSIGNALED(status)) result += "signal " + std::to_string(WTERMSIG(status)) + "\n";
    else if (status != 0) result += "status " + std::to_string(WEXITSTATUS(status)) + "\n";
    return result + listing();
  }

 private:
#ifdef SCMP_ACT_NOTIFY
  // Does `start` in a thread whose calls, and those of the program that it starts, the kernel holds
  // until they are answered.
  static void watch_calls(const watcher& watch, const action& start) {
    const scmp_filter_ctx filter = seccomp_init(SCMP_ACT_NOTIFY);
    // The C library, or a sanitizer, aborts where these fail.
    for (const char* name :
         {"execve", "exit", "exit_group", "futex",
#ifdef __SANITIZE_ADDRESS__
          "mmap", "munmap", "madvise", "brk", "sigaltstack", "rt_sigprocmask", "gettid", "tgkill"
#endif
         })
      seccomp_rule_add(filter, SCMP_ACT_ALLOW, seccomp_syscall_resolve_name(name), 0);
    seccomp_notif* call = nullptr;
    seccomp_notif_resp* answer = nullptr;
    ASSERT_EQ(seccomp_notify_alloc(&call, &answer), 0);
    std::promise<int> loaded;
    std::thread starter([&] {
      loaded.set_value(seccomp_load(filter) == 0 ? seccomp_notify_fd(filter) : -1);
      start();
    });
    answer_calls(loaded.get_future().get(), *call, *answer, watch);
    starter.join();
    seccomp_notify_free(call, answer);
    seccomp_release(filter);
    // Closes the listener, without which the library would not ask for another.
    seccomp_reset(nullptr, 0);
  }

  inline static const int sigaction = seccomp_syscall_resolve_name("rt_sigaction");

  // `watch` decides about the program's calls, from where main() ignores SIGPIPE. Nothing else may
  // allocate here: the thread may hold the lock.
  static void answer_calls(int fd, seccomp_notif& call, seccomp_notif_resp& answer,
                           const watcher& watch) {
    __u32 program = 0;
    pollfd listener = {fd, POLLIN, 0};
    while (fd != -1 && ::poll(&listener, 1, -1) == 1 && listener.revents == POLLIN) {
      call = {};  // The kernel asks for zeros.
      if (seccomp_notify_receive(fd, &call) != 0) continue;
      if (call.data.nr == sigaction && call.data.args[0] == SIGPIPE) program = call.pid;
      answer = {call.id, 0, 0, SECCOMP_USER_NOTIF_FLAG_CONTINUE};
      if (call.pid == program) {
        char* const name = seccomp_syscall_resolve_num_arch(call.data.arch, call.data.nr);
        if (const int error = watch(name); error != 0) answer = {call.id, 0, -error, 0};
        // A brk that fails gives the end of the heap as it is, and no error number; 0 will do.
        if (name == std::string("brk")) answer.error = 0;
        std::free(name);
      }
      seccomp_notify_respond(fd, &answer);
    }
  }
#else
  static void watch_calls(const watcher&, const action& start) { start(); }
#endif
};

}  // namespace kelvane

#endif  // KELVANE_TESTS_DEVICE_H_
