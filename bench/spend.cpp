/// What a program costs: runs it with its standard output thrown away, and prints the seconds of the CPU that it and
/// all its children took, user and system together, and the most bytes that one of them had in memory.
///   tav_spend PROGRAM [ARGUMENT]...
///
/// A process begins with the peak of the one that started it: so this is one of few pages, and no script.
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>

namespace
{

double secondsOf(const timeval& time)
{
  return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_usec) / 1e6;
}

} // namespace

int main(int argc, char** argv)
{
  if (argc < 2)
  {
    std::fputs("usage: tav_spend PROGRAM [ARGUMENT]...\n", stderr);
    return 2;
  }
  const pid_t child = fork();
  if (child == 0)
  {
    if (std::freopen("/dev/null", "w", stdout) != nullptr)
    {
      execvp(argv[1], argv + 1);
    }
    std::perror(argv[1]);
    _exit(127);
  }
  int status = 0;
  rusage spent{};
  if (child < 0 || wait4(child, &status, 0, &spent) != child || !WIFEXITED(status))
  {
    std::fprintf(stderr, "tav_spend: %s did not end\n", argv[1]);
    return 1;
  }
  std::printf("%.6f %lld\n", secondsOf(spent.ru_utime) + secondsOf(spent.ru_stime),
              static_cast<long long>(spent.ru_maxrss) * 1024);
  return WEXITSTATUS(status);
}
