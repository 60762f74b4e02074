/// @file childPosix.h
/// Processes for the tests of files.
#pragma once

#include <array>
#include <cerrno>
#include <csignal>
#include <cstdint>
#include <cstdio>
#include <functional>
#include <stdexcept>
#include <sys/wait.h>
#include <unistd.h>

/// A process that runs `work` and hands its code back. The work must not use the test framework.
class Child
{
public:
  explicit Child(const std::function<uint32_t()>& work)
  {
    if (pipe(pipe_.data()) != 0)
    {
      throw std::runtime_error("no pipe");
    }
    std::fflush(nullptr); // or the process inherits what is not printed yet
    process_ = fork();
    if (process_ < 0)
    {
      throw std::runtime_error("no process");
    }
    if (process_ > 0)
    {
      ::close(pipe_[1]);
      return;
    }
    ::close(pipe_[0]);
    const uint32_t code = work();
    const bool told = ::write(pipe_[1], &code, sizeof code) == sizeof code;
    _exit(told ? 0 : 1); // past the checks at exit, which are the parent's
  }
  ~Child()
  {
    if (process_ <= 0)
    {
      return;
    }
    ::kill(process_, SIGKILL); // nobody waits for it, so the test has failed, and it may wait for the test
    result();
  }
  Child(const Child&) = delete;
  Child& operator=(const Child&) = delete;

  /// Waits for the end; UINT32_MAX when the process died before.
  uint32_t result()
  {
    uint32_t code = UINT32_MAX;
    ssize_t got = 0;
    do
    {
      got = ::read(pipe_[0], &code, sizeof code);
    } while (got < 0 && errno == EINTR); // some tests interrupt themselves
    if (got != sizeof code)
    {
      code = UINT32_MAX;
    }
    ::close(pipe_[0]);
    while (waitpid(process_, nullptr, 0) < 0 && errno == EINTR)
    {}
    process_ = -1;
    return code;
  }

private:
  std::array<int, 2> pipe_ = {-1, -1};
  pid_t process_ = -1;
};

inline uint32_t inChild(const std::function<uint32_t()>& work)
{
  return Child(work).result();
}
