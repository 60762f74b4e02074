#include <algorithm>
#include <vector>

// before the system's main header
#include <winsock2.h>

#include "kor/wideText.h"
#include "kor/windows.h"
#include "tools/host/sockets.h"

#include <shellapi.h> // behind the system's main header

namespace tav::host
{
namespace
{
/// The system's part for sockets, for as long as the program runs.
class Winsock
{
public:
  Winsock() { ready_ = WSAStartup(MAKEWORD(2, 2), &data_) == 0; }
  ~Winsock()
  {
    if (ready_)
    {
      WSACleanup();
    }
  }
  Winsock(const Winsock&) = delete;
  Winsock& operator=(const Winsock&) = delete;
  [[nodiscard]] bool isReady() const { return ready_; }

private:
  WSADATA data_{};
  bool ready_ = false;
};

SOCKET handleOf(const Socket& socket)
{
  return static_cast<SOCKET>(socket.number());
}

/// Makes a new socket one that nothing waits for.
Socket prepared(SOCKET handle)
{
  if (handle == INVALID_SOCKET)
  {
    return {};
  }
  Socket socket(static_cast<int64_t>(handle));
  u_long nonBlocking = 1;
  return ioctlsocket(handle, static_cast<long>(FIONBIO), &nonBlocking) == 0 ? std::move(socket) : Socket();
}

std::optional<size_t> moved(int count)
{
  if (count >= 0)
  {
    return static_cast<size_t>(count);
  }
  return WSAGetLastError() == WSAEWOULDBLOCK ? std::nullopt : std::optional<size_t>(0);
}
} // namespace

void closeSocket(int64_t number)
{
  closesocket(static_cast<SOCKET>(number));
}

Socket listenOnLoopback(uint16_t& port)
{
  static const Winsock system;
  Socket socket = system.isReady() ? prepared(::socket(AF_INET, SOCK_STREAM, 0)) : Socket();
  sockaddr_in address{};
  address.sin_family = AF_INET;
  address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  auto* const plain = reinterpret_cast<sockaddr*>(&address);
  int length = sizeof address;
  const bool listens = socket.isOpen() && ::bind(handleOf(socket), plain, length) == 0 &&
                       ::listen(handleOf(socket), SOMAXCONN) == 0 &&
                       ::getsockname(handleOf(socket), plain, &length) == 0;
  port = ntohs(address.sin_port);
  return listens ? std::move(socket) : Socket();
}

Socket acceptConnection(const Socket& listening)
{
  return prepared(::accept(handleOf(listening), nullptr, nullptr));
}

std::optional<size_t> receiveBytes(const Socket& from, std::span<char> to)
{
  return moved(::recv(handleOf(from), to.data(), static_cast<int>(to.size()), 0));
}

std::optional<size_t> sendBytes(const Socket& to, std::string_view bytes)
{
  return moved(::send(handleOf(to), bytes.data(), static_cast<int>(bytes.size()), 0));
}

void endSending(const Socket& socket)
{
  ::shutdown(handleOf(socket), SD_SEND);
}

void waitForSockets(std::span<Awaited> all, int milliseconds)
{
  std::vector<WSAPOLLFD> asked;
  asked.reserve(all.size());
  for (const Awaited& one : all)
  {
    asked.push_back({handleOf(*one.socket), static_cast<SHORT>(one.forSending ? POLLWRNORM : POLLRDNORM), 0});
  }
  const int count = WSAPoll(asked.data(), static_cast<ULONG>(asked.size()), milliseconds);
  for (size_t i = 0; i < all.size(); ++i)
  {
    all[i].hasCome = count > 0 && asked[i].revents != 0; // an error has come, too: the next call tells it
  }
}

Browser::Browser(const std::string& address)
{
  std::wstring wide;
  constexpr INT_PTR kLastError = 32; // of those that the call returns
  failed_ = kor::widen(address.c_str(), wide) != ERROR_SUCCESS ||
            reinterpret_cast<INT_PTR>(ShellExecuteW(nullptr, L"open", wide.c_str(), nullptr, nullptr, SW_SHOWNORMAL)) <=
                kLastError;
}

bool Browser::hasFailed()
{
  return failed_;
}
} // namespace tav::host
