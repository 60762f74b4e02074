#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

#include "tools/host/host.h"
#include "tools/host/sockets.h"

namespace tav::host
{
namespace
{
int descriptorOf(const Socket& socket)
{
  return static_cast<int>(socket.number());
}

/// Makes a new socket one that nothing waits for and no other program gets.
Socket prepared(int descriptor)
{
  Socket socket(descriptor);
  if (descriptor < 0)
  {
    return {};
  }
  const bool ready = ::fcntl(descriptor, F_SETFD, FD_CLOEXEC) == 0 && ::fcntl(descriptor, F_SETFL, O_NONBLOCK) == 0;
  return ready ? std::move(socket) : Socket();
}

/// What a call that moves bytes has done.
std::optional<size_t> moved(ssize_t count)
{
  if (count >= 0)
  {
    return static_cast<size_t>(count);
  }
  const bool later = errno == EAGAIN || errno == EWOULDBLOCK || errno == EINTR;
  return later ? std::nullopt : std::optional<size_t>(0);
}

/// What the new process does until it is the browser: away from this terminal, whose interrupts are not for it.
[[noreturn]] void becomeBrowser(const char* command, const char* address)
{
  ::setsid();
  for (const int number : {SIGINT, SIGTERM, SIGHUP, SIGQUIT, SIGPIPE, SIGXFSZ}) std::signal(number, SIG_DFL);
  const int nowhere = ::open("/dev/null", O_RDWR);
  for (const int stream : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) ::dup2(nowhere, stream);
  ::execl("/bin/sh", "sh", "-c", command, "sh", address, static_cast<char*>(nullptr));
  ::_exit(127);
}

/// The command of the shell for a browser: the first of BROWSER that can be started, as other programs take it. The
/// address is its first argument.
std::string browserCommand()
{
  std::string command;
  for (std::string one : pathList("BROWSER"))
  {
    const size_t place = one.find("%s");
    place == std::string::npos ? void(one += " \"$1\"") : void(one.replace(place, 2, "\"$1\""));
    command += one + " || ";
  }
  return command + "xdg-open \"$1\"";
}
} // namespace

void closeSocket(int64_t number)
{
  ::close(static_cast<int>(number));
}

Socket listenOnLoopback(uint16_t& port)
{
  Socket socket = prepared(::socket(AF_INET, SOCK_STREAM, 0));
  sockaddr_in address{};
  address.sin_family = AF_INET;
  address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  auto* const plain = reinterpret_cast<sockaddr*>(&address);
  socklen_t length = sizeof address;
  const bool listens = socket.isOpen() && ::bind(descriptorOf(socket), plain, length) == 0 &&
                       ::listen(descriptorOf(socket), SOMAXCONN) == 0 &&
                       ::getsockname(descriptorOf(socket), plain, &length) == 0;
  port = ntohs(address.sin_port);
  return listens ? std::move(socket) : Socket();
}

Socket acceptConnection(const Socket& listening)
{
  return prepared(::accept(descriptorOf(listening), nullptr, nullptr));
}

std::optional<size_t> receiveBytes(const Socket& from, std::span<char> to)
{
  return moved(::recv(descriptorOf(from), to.data(), to.size(), 0));
}

std::optional<size_t> sendBytes(const Socket& to, std::string_view bytes)
{
  return moved(::send(descriptorOf(to), bytes.data(), bytes.size(), 0));
}

void endSending(const Socket& socket)
{
  ::shutdown(descriptorOf(socket), SHUT_WR);
}

void waitForSockets(std::span<Awaited> all, int milliseconds)
{
  std::vector<pollfd> asked;
  asked.reserve(all.size());
  for (const Awaited& one : all)
  {
    asked.push_back({descriptorOf(*one.socket), static_cast<short>(one.forSending ? POLLOUT : POLLIN), 0});
  }
  const int count = ::poll(asked.data(), static_cast<nfds_t>(asked.size()), milliseconds);
  for (size_t i = 0; i < all.size(); ++i)
  {
    all[i].hasCome = count > 0 && asked[i].revents != 0; // an error has come, too: the next call tells it
  }
}

Browser::Browser(const std::string& address)
{
  const std::string command = browserCommand();
  process_ = ::fork();
  if (process_ == 0)
  {
    becomeBrowser(command.c_str(), address.c_str());
  }
  failed_ = process_ < 0;
}

bool Browser::hasFailed()
{
  int status = 0;
  if (process_ > 0 && ::waitpid(static_cast<pid_t>(process_), &status, WNOHANG) == process_)
  {
    process_ = -1;
    failed_ = !WIFEXITED(status) || WEXITSTATUS(status) != 0;
  }
  return failed_;
}
} // namespace tav::host
