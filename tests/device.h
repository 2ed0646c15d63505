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

#include <filesystem>
#include <fstream>
#include <functional>
#include <future>
#include <map>
#include <sstream>

#include <regex>
#include "foundation/warning.h"

namespace kelvane {

namespace fs = std::filesystem;
using text_pairs = std::vector<std::pair<std::string, std::string>>;
using action = std::function<void()>;
// Answers each system call of a run, given its name: 0 lets it happen, an error number fails it.
using watcher = std::function<int(const std::string& call)>;

struct device : testing::Test {
  // Enters the throw-away root, tests/root of the build directory.
  void SetUp() override {
    static const bool entered = ::chroot(KELVANE_ROOT) == 0 && ::chdir("/") == 0;
    ASSERT_TRUE(entered) << "be root, or start this by: unshare --map-root-user";
    ::umask(020);  // Leaves modes that no program would ask for.
    prepare_warnings();
  }

  static std::vector<std::string> lines_of(const std::string& text) {
    std::vector<std::string> lines;
    std::istringstream stream(std::regex_replace(text, std::regex("~"), "/var/db/timezone"));
    for (std::string line; std::getline(stream >> std::ws, line);) lines.push_back(line);
    return lines;
  }

  // The messages, then the entries in order: the last of each path, unless "- PATH" follows.
  static std::string text(const std::string& lines) {
    std::string result;
    std::map<std::string, std::string> entries;
    for (const std::string& line : lines_of(lines))
      if (line[0] == '/') entries[line.substr(0, line.find(' '))] = line + "\n";
      else if (line[0] == '-') entries.erase(line.substr(2));
      else result += line + "\n";
    for (const auto& [path, entry] : entries) result += entry;
    return result;
  }

  // Makes a device of these entries alone.
  static void build(const std::string& entries) {
    for (const char* top : {"/usr/share", "/var"}) fs::remove_all(top), fs::create_directories(top);
    for (const std::string& entry : lines_of(text("/var/db/\n" + entries))) {
      const std::size_t file = entry.find(" = "), link = entry.find(" -> ");
      const fs::path path = entry.substr(0, std::min(file, link));
      fs::create_directories(path.parent_path());
      if (file != std::string::npos) std::ofstream(path) << entry.substr(file + 3);
      if (link != std::string::npos) fs::create_symlink(entry.substr(link + 4), path);
    }
  }

  static std::string listing() {
    std::string entries;
    for (const char* top : {"/usr/share", "/var"})
      for (const fs::directory_entry& at : fs::recursive_directory_iterator(top)) {
        const std::string path = at.path();
        if (at.is_symlink()) entries += path + " -> " + fs::read_symlink(path).string() + "\n";
        else if (at.is_regular_file()) entries += path + " = " + content(path) + "\n";
        else if (!at.is_directory()) entries += path + " ?\n";
        else if (fs::is_empty(path)) entries += path + "/\n";
      }
    return text(entries);
  }
  static std::string content(const std::string& file) {
    return {std::istreambuf_iterator<char>(std::ifstream(file).rdbuf()), {}};
  }

  // What was last said, without the program's name and the error texts, nor what counts coverage.
  static std::string said() {
    static const std::regex line("kelvane: (.*): .*(\n)|LLVM .*\n",
                                 std::regex::ECMAScript | std::regex_constants::__polynomial);
    return std::regex_replace(content("/said"), line, "$1$2");
  }

  // What `act` said and then threw in a new process, and "status N" unless that ended with 0; as in
  // a shell, N is 128 more than the number of a signal.
  static std::string outcome(const action& act, const watcher& watch = {}) {
    int status = -1;
    const auto start = [&] {
      if (::fork() != 0) return static_cast<void>(::wait(&status));
      ::dup2(::dup2(::open("/said", O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600), 2), 1);
      ::alarm(60);  // Ends a run that hangs, with status 142.
      try {
        act();
      } catch (int error) {
        errno = error, warn("int %d", error);
      } catch (const std::logic_error& error) {
        warn("%s %s", typeid(error).name(), error.what());
      }
      std::exit(0);
    };
    watch ? watch_calls(watch, start) : start();
    // The line after one about a failed call ends in the same error text.
    static const std::regex other_error("(remove|link): .*: ([^:]*)\n.*: (?!\\2\n)[^:]*\n");
    EXPECT_FALSE(std::regex_search(content("/said"), other_error)) << content("/said");
    const int code = WIFSIGNALED(status) ? 128 + WTERMSIG(status) : WEXITSTATUS(status);
    return said() + (code != 0 ? "status " + std::to_string(code) + "\n" : "");
  }

  static std::string no_version(const std::string& text) {
    const std::string warning = "Cannot parse version string " + text;
    return warning + ", results.size() = 0\n" + warning + "\n";
  }

  // Runs the program, after `prepare` in its process: the outcome, and what the device then holds.
  static std::string boot(watcher watch = {}, const action& prepare = {}) {
    const action run = [&] {
      // A sanitizer's own calls at the end of a run fail as well.
      if (watch) ::setenv("ASAN_OPTIONS", "abort_on_error=1:detect_leaks=0", 1);
      if (prepare) prepare();
      ::execl("/sbin/emulator", "emulator", "/sbin/kelvane", nullptr);  // Of another machine.
      ::execl("/sbin/kelvane", "any-name", "--version", "-n", nullptr);
    };
    return outcome(run, watch).append(listing());
  }

  // Boots a device of each first text, which gives the second: what is said, then what changes.
  static void expect(const std::string& base, const text_pairs& table, const watcher& watch = {},
                     const action& prepare = {}) {
    // Unless calls fail, then with longer numbers in versions and schemas: neither has a limit.
    for (std::size_t zeros = 0; zeros <= (watch ? 0U : 200U); zeros += 200)
      for (auto [before, after] : table) {
        before = base + before + "\n", after = before + after;
        for (std::string* const each : {&before, &after})
          *each = std::regex_replace(*each, std::regex("20|44"), std::string(zeros, '0') + "$&");
        build(before);
        EXPECT_EQ(boot(watch, prepare), text(after)) << "of the device\n" << text(before);
      }
  }

  // Does `start` in a thread. The kernel holds the calls of the thread and of the program started;
  // here they are let go, from main()'s ignoring of SIGPIPE on as `watch` decides.
  static void watch_calls(const watcher& watch, const action& start) {
#ifdef KELVANE_SECCOMP
    const scmp_filter_ctx filter = seccomp_init(SCMP_ACT_NOTIFY);
    // The C library, or a sanitizer, aborts where these fail; set_value() below needs futex.
    for (const std::string name : {"exit_group", "futex", "madvise", "munmap", "mmap", "brk"})
      if (KELVANE_SANITIZED || (name != "mmap" && name != "brk"))
        seccomp_rule_add(filter, SCMP_ACT_ALLOW, seccomp_syscall_resolve_name(name.c_str()), 0);
    std::promise<int> loaded;
    const auto starter = std::async(std::launch::async, [&] {
      loaded.set_value(seccomp_load(filter) == 0 ? seccomp_notify_fd(filter) : 1 << 30);
      start();
    });
    // Before the run nothing here may allocate: the thread may hold the lock. 1 << 30 is not open.
    pollfd listener = {loaded.get_future().get(), POLLIN, 0};
    for (__u32 ours = 0; ::poll(&listener, 1, -1) == 1 && listener.revents == POLLIN;) {
      seccomp_notif call = {};
      if (seccomp_notify_receive(listener.fd, &call) != 0) continue;
      if (call.data.nr == SCMP_SYS(rt_sigaction) && call.data.args[0] == SIGPIPE) ours = call.pid;
      seccomp_notif_resp answer = {call.id, 0, 0, SECCOMP_USER_NOTIF_FLAG_CONTINUE};
      if (call.pid == ours) {
        // Root may do all, so that only the call itself shows what exists() asks for.
        EXPECT_TRUE(call.data.nr != SCMP_SYS(access) || call.data.args[1] == F_OK);
        char* const name = seccomp_syscall_resolve_num_arch(call.data.arch, call.data.nr);
        if (const int error = watch(name); error != 0) answer = {call.id, 0, -error, 0};
        // A brk that fails gives the end of the heap as it is, and no error number; 0 will do.
        if (name == std::string("brk")) answer.error = 0;
        std::free(name);
      }
      seccomp_notify_respond(listener.fd, &answer);
    }
    starter.wait();
    seccomp_release(filter);
    seccomp_reset(nullptr, 0);  // Closes the listener; else the library would not ask for another.
#endif
  }
};

}  // namespace kelvane

#endif  // KELVANE_TESTS_DEVICE_H_
