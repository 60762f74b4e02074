/// @file server.h
/// Answers requests from this machine, one thread for all connections: none of them can keep the others waiting.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <list>
#include <span>
#include <string>
#include <utility>
#include <vector>

#include "tools/host/sockets.h"
#include "tools/http/request.h"

namespace tav::tool
{

/// What a request gets.
struct HttpAnswer
{
  int status = 200;
  std::string type = "text/plain; charset=utf-8";
  std::vector<std::pair<std::string, std::string>> fields{}; ///< beside those that every answer has
  std::string body{};
  /// Behind `body`, from somewhere else: how many bytes, and what fills a piece of them from where on. The connection
  /// ends when it does not fill it.
  uint64_t more = 0;
  std::function<bool(uint64_t offset, std::span<char> to)> fill{};
};

/// An answer that says no.
HttpAnswer refusal(int status);

class HttpServer
{
public:
  using Clock = std::chrono::steady_clock;
  using Answering = std::function<HttpAnswer(const HttpRequest&)>;

  /// Listens on the loopback from now on. Throws Failure.
  HttpServer();

  uint16_t port() const { return port_; }
  /// "127.0.0.1:8080"
  std::string host() const { return "127.0.0.1:" + std::to_string(port_); }

  /// Answers what has come, and waits a quarter of a second at the most for it.
  void serve(const Answering& answering);

  /// When something was last sent or received.
  Clock::time_point lastActive() const { return lastActive_; }

private:
  struct Connection
  {
    host::Socket socket;
    Clock::time_point since{}; ///< when it last did something
    std::string head{};        ///< of a request, as far as it has come
    std::string out{};         ///< what is to be sent
    size_t sent = 0;           ///< of it
    HttpAnswer answer{};       ///< its bytes from somewhere else
    uint64_t done = 0;         ///< of those
    bool isAnswered = false;   ///< the last look at `head` has found a request
    bool isLast = false;       ///< it ends behind this answer
    bool isOver = false;       ///< it has ended on this side; what still comes is passed over
    size_t passedOver = 0;     ///< of that

    bool isSending() const { return sent < out.size() || done < answer.more; }
  };

  void accept();
  bool go(Connection& connection, const Answering& answering);
  bool receive(Connection& connection);
  void take(Connection& connection, const Answering& answering);
  bool send(Connection& connection);

  uint16_t port_ = 0;
  host::Socket listening_;
  std::list<Connection> connections_{};
  Clock::time_point lastActive_ = Clock::now();
};

} // namespace tav::tool
