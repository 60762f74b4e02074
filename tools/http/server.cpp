#include "tools/http/server.h"

#include <algorithm>
#include <array>
#include <optional>
#include <string_view>

#include "tools/shell/report.h"

namespace tav::tool
{

namespace
{

constexpr size_t kMostConnections = 64;
constexpr size_t kMostPassedOver = size_t{1} << 20U;
constexpr size_t kPiece = size_t{256} * 1024;
constexpr int kPatience = 250; ///< milliseconds; an interrupt that comes just before a wait is seen behind it
constexpr std::string_view kHeadEnd = "\r\n\r\n";

std::string_view nameOf(int status)
{
  switch (status)
  {
  case 200: return "OK";
  case 204: return "No Content";
  case 206: return "Partial Content";
  case 303: return "See Other";
  case 400: return "Bad Request";
  case 403: return "Forbidden";
  case 404: return "Not Found";
  case 405: return "Method Not Allowed";
  case 412: return "Precondition Failed";
  case 416: return "Range Not Satisfiable";
  case 421: return "Misdirected Request";
  case 431: return "Request Header Fields Too Large";
  case 505: return "HTTP Version Not Supported";
  default: return "Status";
  }
}

/// The head of an answer. Nothing is kept by anybody, nor shown inside of other pages, nor told to other hosts.
std::string headOf(const HttpAnswer& answer, bool isLast)
{
  std::string head = "HTTP/1.1 " + std::to_string(answer.status) + " ";
  head += nameOf(answer.status);
  head += "\r\n";
  if (answer.status != 204)
  {
    head += "Content-Type: " + answer.type + "\r\nContent-Length: " + std::to_string(answer.body.size() + answer.more) +
            "\r\n";
  }
  for (const auto& [name, value] : answer.fields)
  {
    head.append(name).append(": ").append(value).append("\r\n");
  }
  head += "Cache-Control: no-store\r\nX-Content-Type-Options: nosniff\r\nX-Frame-Options: DENY\r\n"
          "Referrer-Policy: no-referrer\r\nCross-Origin-Resource-Policy: same-origin\r\n"
          "Cross-Origin-Opener-Policy: same-origin\r\n";
  head += isLast ? "Connection: close\r\n\r\n" : "\r\n";
  return head;
}

} // namespace

HttpAnswer refusal(int status)
{
  HttpAnswer answer{.status = status};
  answer.body = std::to_string(status) + " " + std::string(nameOf(status)) + "\n";
  if (status == 405)
  {
    answer.fields.emplace_back("Allow", "GET, HEAD");
  }
  return answer;
}

HttpServer::HttpServer()
    : listening_(host::listenOnLoopback(port_))
{
  if (!listening_.isOpen())
  {
    throw Failure("127.0.0.1: the system gives no port to listen at");
  }
}

void HttpServer::serve(const Answering& answering)
{
  std::vector<host::Awaited> awaited{{.socket = &listening_}};
  for (const Connection& connection : connections_)
  {
    awaited.push_back({.socket = &connection.socket, .forSending = connection.isSending()});
  }
  host::waitForSockets(awaited, kPatience);
  auto connection = connections_.begin();
  for (size_t i = 1; i < awaited.size(); ++i)
  {
    const bool goesOn = !awaited[i].hasCome || go(*connection, answering);
    connection = goesOn ? std::next(connection) : connections_.erase(connection);
  }
  if (awaited.front().hasCome)
  {
    accept();
  }
}

void HttpServer::accept()
{
  host::Socket socket = host::acceptConnection(listening_);
  if (!socket.isOpen())
  {
    return;
  }
  if (connections_.size() == kMostConnections)
  {
    // Those that say nothing must not keep others out.
    connections_.erase(std::min_element(connections_.begin(), connections_.end(),
                                        [](const Connection& a, const Connection& b) { return a.since < b.since; }));
  }
  connections_.emplace_back();
  connections_.back().socket = std::move(socket);
  connections_.back().since = Clock::now();
}

/// Does what can be done without waiting; false when the connection is over.
bool HttpServer::go(Connection& connection, const Answering& answering)
{
  if (!connection.isSending() && !receive(connection))
  {
    return false;
  }
  do
  {
    if (!connection.isSending())
    {
      take(connection, answering);
    }
    if (connection.isSending() && !send(connection))
    {
      return false;
    }
  } while (connection.isAnswered && !connection.isSending() && !connection.head.empty());
  return true;
}

bool HttpServer::receive(Connection& connection)
{
  std::array<char, 4096> room{};
  const std::optional<size_t> count = host::receiveBytes(connection.socket, room);
  connection.since = Clock::now();
  if (!connection.isOver)
  {
    connection.head.append(room.data(), count.value_or(0));
    return count != size_t{0};
  }
  connection.passedOver += count.value_or(0);
  return count != size_t{0} && connection.passedOver < kMostPassedOver;
}

/// Answers the request when all of its head is there. What follows it is the next one.
void HttpServer::take(Connection& connection, const Answering& answering)
{
  connection.isAnswered = false;
  const size_t end = connection.head.find(kHeadEnd);
  const bool isWhole = end != std::string::npos && end + kHeadEnd.size() <= kLongestHead;
  if (!isWhole && connection.head.size() <= kLongestHead)
  {
    return;
  }
  HttpRequest request;
  const int status =
      isWhole ? readRequest(std::string_view(connection.head).substr(0, end + kHeadEnd.size()), request) : 431;
  connection.answer = status == 0 ? answering(request) : refusal(status);
  // What was refused may have left anything on its connection.
  connection.isLast = request.isLast || connection.answer.status >= 400;
  connection.out = headOf(connection.answer, connection.isLast);
  connection.sent = 0;
  connection.done = 0;
  connection.isAnswered = true;
  if (request.isHead)
  {
    connection.answer.more = 0;
  }
  else
  {
    connection.out += connection.answer.body;
  }
  connection.head.erase(0, isWhole ? end + kHeadEnd.size() : std::string::npos);
  lastActive_ = Clock::now();
}

bool HttpServer::send(Connection& connection)
{
  connection.since = lastActive_ = Clock::now();
  if (connection.sent == connection.out.size())
  {
    const uint64_t left = connection.answer.more - connection.done;
    connection.out.resize(static_cast<size_t>(std::min<uint64_t>(left, kPiece)));
    connection.sent = 0;
    if (!connection.answer.fill(connection.done, connection.out))
    {
      return false;
    }
    connection.done += connection.out.size();
  }
  const std::optional<size_t> count =
      host::sendBytes(connection.socket, std::string_view(connection.out).substr(connection.sent));
  connection.sent += count.value_or(0);
  if (!connection.isSending() && connection.isLast)
  {
    // To close it while something is unread would take the answer back from who has not read it yet.
    connection.isOver = true;
    connection.head.clear();
    host::endSending(connection.socket);
  }
  return count != size_t{0};
}

} // namespace tav::tool
