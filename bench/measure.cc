// Times programs in turn inside a throw-away root: measure ROOT RUNS PROGRAM...
//
// Writes a line for each program: the medians of its wall time in milliseconds and of its peak
// memory in KiB. Before each run, untimed, the links and the record are put back.

#include <fcntl.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <iterator>
#include <vector>

namespace {

constexpr const char* links[] = {"/var/db/timezone/zoneinfo", "/var/db/timezone/icutz"};

struct program {
  char* path;
  std::vector<double> milliseconds = {}, kibibytes = {};
};

void require(bool condition, const char* what) {
  if (condition) return;
  std::fprintf(stderr, "measure: this has failed: %s\n", what);
  std::exit(EXIT_FAILURE);
}

// A plain fork, because after a vfork the kernel counts this process's memory as the program's.
void run(program& subject, int silence) {
  const auto start = std::chrono::steady_clock::now();
  const pid_t child = ::fork();
  if (child == 0) {
    ::dup2(silence, STDERR_FILENO);
    ::execl(subject.path, subject.path, static_cast<char*>(nullptr));
    ::_exit(EXIT_FAILURE);
  }
  int status = 0;
  rusage usage = {};
  require(child > 0 && ::wait4(child, &status, 0, &usage) == child && status == 0, subject.path);
  const std::chrono::duration<double, std::milli> time = std::chrono::steady_clock::now() - start;
  subject.milliseconds.push_back(time.count());
  subject.kibibytes.push_back(static_cast<double>(usage.ru_maxrss));
}

double median(std::vector<double> values) {
  std::sort(values.begin(), values.end());
  return values.at(values.size() / 2);
}

}  // namespace

int main(int count, char** arguments) {
  require(count > 3, "measure ROOT RUNS PROGRAM...");
  const int silence = ::open("/dev/null", O_WRONLY | O_CLOEXEC);
  require(::chroot(arguments[1]) == 0 && ::chdir("/") == 0, arguments[1]);
  char targets[std::size(links)][1024] = {};
  for (std::size_t i = 0; i < std::size(links); ++i) {
    if (::readlink(links[i], targets[i], sizeof targets[i] - 1) == -1) *targets[i] = '\0';
  }
  std::vector<program> programs;
  for (int i = 3; i < count; ++i) programs.push_back({arguments[i]});
  for (int runs = std::atoi(arguments[2]); runs > 0; --runs) {
    for (program& subject : programs) {
      for (std::size_t i = 0; i < std::size(links); ++i) {
        ::unlink(links[i]);
        if (*targets[i]) require(::symlink(targets[i], links[i]) == 0, links[i]);
      }
      ::unlink("/var/db/timezone/TZVersionDiffRecord");
      run(subject, silence);
    }
  }
  for (const program& subject : programs)
    std::printf("%.3f %.0f\n", median(subject.milliseconds), median(subject.kibibytes));
}
