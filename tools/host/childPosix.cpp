#include <cerrno>
#include <csignal>
#include <cstdio>
#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>
#include <utility>

#include "kor/systemError.h"
#include "tav/kor.h"
#include "tools/host/child.h"

extern char** environ; // NOLINT(readability-redundant-declaration): not every system has it in a header

namespace tav::host
{
using kor::codeOfSystemError;

namespace
{
constexpr int kResult = 3; // of the child's files
constexpr int kSide = 4;
constexpr int kAbove = 10; // where our ends lie until then, so that none of them is one of the child's already

/// An open file of ours, which no child inherits.
class HeldFile
{
public:
  explicit HeldFile(int number = -1)
      : number_(number) {}
  HeldFile(const HeldFile&) = delete;
  HeldFile& operator=(const HeldFile&) = delete;
  ~HeldFile() { close(); }

  /// Takes a copy of another one that is out of the way.
  bool copy(int other)
  {
    close();
    number_ = ::fcntl(other, F_DUPFD_CLOEXEC, kAbove);
    return number_ >= 0;
  }
  void close()
  {
    if (number_ >= 0)
    {
      ::close(number_);
    }
    number_ = -1;
  }
  int number() const { return number_; }
  int release() { return std::exchange(number_, -1); }

private:
  int number_;
};

/// A file without a name that has this text in it, to be read from its start.
bool keep(const std::string& text, HeldFile& to)
{
  std::FILE* const file = std::tmpfile();
  const bool isOpen = file != nullptr && to.copy(::fileno(file));
  const bool isWritten = isOpen && std::fwrite(text.data(), 1, text.size(), file) == text.size();
  const bool isClosed = file != nullptr && std::fclose(file) == 0;
  return isWritten && isClosed && ::lseek(to.number(), 0, SEEK_SET) == 0;
}

bool openPipe(HeldFile& from, HeldFile& to)
{
  int ends[2];
  if (::pipe(ends) != 0)
  {
    return false;
  }
  const HeldFile first(ends[0]);
  const HeldFile second(ends[1]);
  return from.copy(first.number()) && to.copy(second.number());
}

/// What the new process does before it is the program: takes its files, and the signals that this program ignores.
class Preparation
{
public:
  Preparation()
  {
    ::posix_spawn_file_actions_init(&files_);
    ::posix_spawnattr_init(&attributes_);
    sigset_t again;
    sigemptyset(&again);
    for (const int number : {SIGINT, SIGTERM, SIGPIPE, SIGXFSZ}) sigaddset(&again, number);
    ::posix_spawnattr_setsigdefault(&attributes_, &again);
    ::posix_spawnattr_setflags(&attributes_, POSIX_SPAWN_SETSIGDEF);
  }
  Preparation(const Preparation&) = delete;
  Preparation& operator=(const Preparation&) = delete;
  ~Preparation()
  {
    ::posix_spawn_file_actions_destroy(&files_);
    ::posix_spawnattr_destroy(&attributes_);
  }

  void give(const HeldFile& ours, int number)
  {
    ::posix_spawn_file_actions_adddup2(&files_, ours.number(), number);
  }
  void giveNothing(int number)
  {
    ::posix_spawn_file_actions_addopen(&files_, number, "/dev/null", O_WRONLY, 0);
  }
  int start(pid_t& process, const std::string& program, char* const* words) const
  {
    return ::posix_spawn(&process, program.c_str(), &files_, &attributes_, words, environ);
  }

private:
  posix_spawn_file_actions_t files_{};
  posix_spawnattr_t attributes_{};
};
} // namespace

bool Child::isPossible()
{
  return true;
}

uint32_t Child::start(const std::string& program, const std::vector<std::string>& words, const ChildTexts& texts)
{
  HeldFile input;
  HeldFile side;
  HeldFile from;
  HeldFile to;
  if (!keep(texts.input, input) || (!texts.side.empty() && !keep(texts.side, side)) || !openPipe(from, to))
  {
    return codeOfSystemError(errno);
  }
  Preparation preparation;
  preparation.give(input, STDIN_FILENO);
  preparation.giveNothing(STDOUT_FILENO);
  preparation.give(to, kResult);
  texts.side.empty() ? void() : preparation.give(side, kSide);

  std::vector<std::string> all{program};
  all.insert(all.end(), words.begin(), words.end());
  std::vector<char*> pointers;
  pointers.reserve(all.size() + 1);
  for (std::string& word : all) pointers.push_back(word.data());
  pointers.push_back(nullptr);
  pid_t process = -1;
  if (const int error = preparation.start(process, program, pointers.data()); error != 0)
  {
    return codeOfSystemError(error);
  }
  process_ = process;
  from_ = from.release();
  return TAV_RC_OK;
}

uint32_t Child::read(char* to, size_t most, size_t& count)
{
  ssize_t done = -1;
  do
  {
    done = ::read(from_, to, most);
  } while (done < 0 && errno == EINTR);
  count = done < 0 ? 0 : static_cast<size_t>(done);
  return done < 0 ? codeOfSystemError(errno) : TAV_RC_OK;
}

int Child::wait()
{
  int status = 0;
  while (::waitpid(static_cast<pid_t>(process_), &status, 0) < 0 && errno == EINTR)
  {
  }
  process_ = -1;
  ::close(from_);
  from_ = -1;
  return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

Child::~Child()
{
  if (process_ > 0)
  {
    ::kill(static_cast<pid_t>(process_), SIGTERM);
    wait();
  }
}
} // namespace tav::host
