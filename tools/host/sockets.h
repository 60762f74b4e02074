/// @file sockets.h
/// Connections from this machine alone, and the browser that makes them.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <utility>

namespace tav::host
{
inline constexpr int64_t kNoSocket = -1;

/// Ends a connection, or listening.
void closeSocket(int64_t number);

/// Owns a socket.
class Socket
{
public:
  Socket() = default;
  explicit Socket(int64_t number)
      : number_(number) {}
  Socket(Socket&& other) noexcept
      : number_(std::exchange(other.number_, kNoSocket)) {}
  Socket& operator=(Socket&& other) noexcept
  {
    std::swap(number_, other.number_);
    return *this;
  }
  Socket(const Socket&) = delete;
  Socket& operator=(const Socket&) = delete;
  ~Socket()
  {
    if (isOpen())
    {
      closeSocket(number_);
    }
  }

  [[nodiscard]] bool isOpen() const { return number_ != kNoSocket; }
  [[nodiscard]] int64_t number() const { return number_; }

private:
  int64_t number_ = kNoSocket;
};

/// Listens on 127.0.0.1, at a port that the system chooses; not open when that does not work.
Socket listenOnLoopback(uint16_t& port);

/// The next connection that has come, if there is one. Nothing that is done with it waits.
Socket acceptConnection(const Socket& listening);

/// Bytes that have come: how many, 0 when none will come any more, nothing when there are none yet.
std::optional<size_t> receiveBytes(const Socket& from, std::span<char> to);

/// Sends what can be sent at once: how many, 0 when nobody takes them any more, nothing when that has to wait.
std::optional<size_t> sendBytes(const Socket& to, std::string_view bytes);

/// Nothing more is sent; the other side may go on.
void endSending(const Socket& socket);

/// What a socket is waited for, and whether that has come.
struct Awaited
{
  const Socket* socket = nullptr;
  bool forSending = false; ///< else for receiving, or a connection
  bool hasCome = false;
};

/// Waits until something has come, an interrupt has, or some milliseconds are over.
void waitForSockets(std::span<Awaited> all, int milliseconds);

/// The browser of whoever runs the program. It goes on when the program has ended.
class Browser
{
public:
  /// Starts it on an address: the commands of BROWSER, else what the desktop has chosen.
  explicit Browser(const std::string& address);

  /// Whether it is known by now that none could be started.
  bool hasFailed();

private:
  int64_t process_ = -1;
  bool failed_ = false;
};
} // namespace tav::host
