#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <sys/ioctl.h>
#include <sys/wait.h>
#include <system_error>
#include <unistd.h>

#include "tools/host/host.h"
#include "tools/host/interruptedFiles.h"
#include "tools/host/interrupts.h"

namespace tav::host
{
namespace
{
InterruptedFiles<char> filesToRemove; // which the handler of a signal may look at
} // namespace

extern "C" void endBySignal(int number)
{
  if (!endsNow(number))
  {
    return;
  }
  filesToRemove.each([](const char* path) { ::unlink(path); });
  std::signal(number, SIG_DFL);
  std::raise(number);
}

std::vector<std::string> commandLine(int argc, char** argv)
{
  return {argv + std::min(argc, 1), argv + argc};
}

std::filesystem::path programPath()
{
  std::error_code error;
  return std::filesystem::read_symlink("/proc/self/exe", error);
}

std::vector<std::string> pathList(const char* variable)
{
  const char* const value = std::getenv(variable);
  return separated(value == nullptr ? "" : value, ':');
}

bool isTerminal(FILE* stream)
{
  return ::isatty(::fileno(stream)) != 0;
}

std::optional<unsigned> terminalWidth()
{
  if (!isTerminal(stdout))
  {
    return std::nullopt;
  }
  winsize size{};
  if (::ioctl(::fileno(stdout), TIOCGWINSZ, &size) == 0 && size.ws_col != 0)
  {
    return size.ws_col;
  }
  return 80;
}

namespace
{
/// What the new process does until it is the command. Signals that this program ignores, it takes again.
[[noreturn]] void becomePager(const std::string& command, const int (&ends)[2])
{
  for (const int number : {SIGINT, SIGPIPE, SIGXFSZ}) std::signal(number, SIG_DFL);
  ::dup2(ends[0], STDIN_FILENO);
  ::close(ends[0]);
  ::close(ends[1]);
  ::setenv("LESS", "FRX", 0); // ends by itself behind less than a screen, takes colours, leaves the text there
  ::execl("/bin/sh", "sh", "-c", command.c_str(), static_cast<char*>(nullptr));
  ::_exit(127);
}
} // namespace

Pager::Pager(const std::string& command)
{
  int ends[2];
  std::fflush(stdout);
  if (::pipe(ends) != 0)
  {
    return;
  }
  process_ = ::fork();
  if (process_ == 0)
  {
    becomePager(command, ends);
  }
  ::close(ends[0]);
  if (process_ > 0)
  {
    before_ = ::dup(STDOUT_FILENO);
    ::dup2(ends[1], STDOUT_FILENO);
    interrupt_ = std::signal(SIGINT, SIG_IGN);
  }
  ::close(ends[1]);
}

Pager::~Pager()
{
  if (process_ <= 0)
  {
    return;
  }
  std::fflush(stdout);
  ::dup2(before_, STDOUT_FILENO); // the command comes to the end of its input
  ::close(before_);
  while (::waitpid(static_cast<pid_t>(process_), nullptr, 0) < 0 && errno == EINTR)
  {
  }
  std::signal(SIGINT, interrupt_);
}

void prepareStandardStreams()
{
  std::signal(SIGPIPE, SIG_IGN);
  std::signal(SIGXFSZ, SIG_IGN);
  for (const int number : {SIGINT, SIGTERM, SIGHUP, SIGQUIT})
  {
    // Who was told to ignore a signal (nohup) goes on ignoring it.
    if (std::signal(number, endBySignal) == SIG_IGN)
    {
      std::signal(number, SIG_IGN);
    }
  }
}

void removeOnInterrupt(const std::string& path)
{
  filesToRemove.add(path);
}

void keepOnInterrupt(const std::string& path)
{
  filesToRemove.drop(path);
}

uint64_t processId()
{
  return static_cast<uint64_t>(::getpid());
}
} // namespace tav::host
