// tav view: the page for browsers, opened on a file from this machine alone.
#include <algorithm>
#include <array>
#include <chrono>
#include <filesystem>
#include <memory>
#include <optional>
#include <random>
#include <string_view>
#include <system_error>
#include <utility>

#include "tav/cpp/valueText.hpp"
#include "tav/inspect.hpp"
#include "tools/host/host.h"
#include "tools/http/server.h"
#include "tools/shell/options.h"
#include "tools/shell/output.h"
#include "tools/shell/report.h"
#include "tools/shell/session.h"

namespace tav::tool
{

namespace
{

constexpr std::chrono::seconds kLinger{3}; ///< a page that is loaded again says goodbye, too

/// 128 bits that nobody can guess.
std::string newToken()
{
  constexpr std::string_view digits = "0123456789abcdef";
  std::random_device random;
  std::string token;
  for (int word = 0; word < 4; ++word)
  {
    for (auto [left, bits] = std::pair(8, random()); left > 0; --left, bits >>= 4U)
    {
      token += digits[bits & 0xFU];
    }
  }
  return token;
}

/// Where a page is that nobody named: beside the program, as it is installed and as the build folder has it.
std::string pagePath(const Invocation& invocation)
{
  if (invocation.has("--page"))
  {
    return invocation.text("--page");
  }
  const std::filesystem::path folder = host::programPath().parent_path();
  const std::filesystem::path path = (folder / "../share/tav/tav.html").lexically_normal();
  std::error_code error;
  if (!std::filesystem::exists(path, error))
  {
    throw Failure("view: the page is not there, as '" + shown(host::textOf(path), stderr) + "'",
                  "it comes with the package tav-tools and with a release, and web/build.sh makes it; --page names one "
                  "elsewhere");
  }
  return host::textOf(path);
}

std::string contentOf(const std::string& path)
{
  const std::unique_ptr<ByteSource> source = ByteSource::open(path);
  std::string content(static_cast<size_t>(source->size()), '\0');
  source->read(0, std::span(reinterpret_cast<uint8_t*>(content.data()), content.size()));
  return content;
}

/// The page with what it has to be told: the name of the file, and the one address that it may ask.
class ViewPage
{
public:
  ViewPage(const std::string& path, std::string_view name, std::string_view address)
      : text_(contentOf(path))
  {
    std::string shownName;
    detail::appendXml(shownName, name, true);
    const bool isOne = put("<meta name=\"tav-view\" content=\"", "", shownName) &&
                       put("connect-src ", "'none'", address);
    if (!isOne)
    {
      throw Failure(kTrouble, Problem{.file = path, .sentence = "this is not the page of this program"});
    }
  }

  const std::string& text() const { return text_; }

private:
  /// Puts a text in the place of another one behind a mark, which is there once.
  bool put(std::string_view mark, std::string_view before, std::string_view what)
  {
    const size_t place = text_.find(mark);
    const size_t from = place + mark.size();
    if (place == std::string::npos || text_.compare(from, before.size(), before) != 0)
    {
      return false;
    }
    text_.replace(from, before.size(), what);
    return true;
  }

  std::string text_;
};

/// The file that is looked at, as it is now: browsers refuse one that has changed since they opened it.
class ViewedFile
{
public:
  explicit ViewedFile(std::string path)
      : path_(std::move(path)) {}

  /// Opens it anew; false when it is gone.
  bool open()
  {
    try
    {
      source_ = ByteSource::open(path_);
      tag_ = tagNow();
    }
    catch (const Error&)
    {
      source_.reset();
    }
    return source_ != nullptr;
  }

  bool hasChanged() const { return source_ == nullptr || tag_ != tagNow(); }
  const std::string& tag() const { return tag_; }
  uint64_t size() const { return source_->size(); }

  bool read(uint64_t offset, std::span<char> to)
  {
    try
    {
      return source_->read(offset, std::span(reinterpret_cast<uint8_t*>(to.data()), to.size())) == to.size();
    }
    catch (const Error&)
    {
      return false;
    }
  }

private:
  std::string tagNow() const
  {
    const std::filesystem::path path = host::pathOf(path_);
    std::error_code error;
    const auto size = std::filesystem::file_size(path, error);
    const auto time = std::filesystem::last_write_time(path, error);
    const std::chrono::nanoseconds when = time.time_since_epoch(); // other libraries count in wider types
    return error ? std::string() : '"' + std::to_string(size) + '-' + std::to_string(when.count()) + '"';
  }

  std::string path_;
  std::unique_ptr<ByteSource> source_{};
  std::string tag_{};
};

/// What the page and its file are asked for. A browser is given a way in that works once: other users of the machine
/// can read the words of its command line.
class View
{
public:
  View(const Invocation& invocation, const std::string& path)
      : file_(path),
        page_(pagePath(invocation), host::textOf(host::pathOf(path).filename()), address())
  {
  }

  std::string address() const { return "http://" + server_.host() + "/" + token_ + "/"; }
  std::string addressOnce() const { return "http://" + server_.host() + "/" + once_ + "/"; }

  void serve()
  {
    server_.serve([this](const HttpRequest& request) { return answer(request); });
  }

  /// Whether all pages have said goodbye, and none has come back.
  bool isLeft() const
  {
    return leave_ && pages_ == 0 && HttpServer::Clock::now() - server_.lastActive() > kLinger;
  }

private:
  HttpAnswer answer(const HttpRequest& request)
  {
    if (request.host != server_.host())
    {
      return refusal(421);
    }
    const bool fromHere = request.origin.empty() || request.origin == "http://" + server_.host();
    const bool fromPage = request.site.empty() || request.site == "same-origin" || request.site == "none";
    if (!fromHere || !fromPage)
    {
      return refusal(403);
    }
    if (!once_.empty() && request.target == "/" + once_ + "/")
    {
      once_.clear();
      return {.status = 303, .fields = {{"Location", "/" + token_ + "/"}}};
    }
    const std::string inside = "/" + token_ + "/";
    return request.target.starts_with(inside) ? answerInside(request, request.target.substr(inside.size()))
                                              : refusal(404);
  }

  HttpAnswer answerInside(const HttpRequest& request, const std::string& name)
  {
    if (name.empty())
    {
      leave_ = leave_ && request.isHead;
      file_.open();
      return {.type = "text/html; charset=utf-8", .body = page_.text()};
    }
    if (name == "file")
    {
      return bytes(request);
    }
    if (name == "hello" || name == "bye")
    {
      const bool comes = name == "hello";
      pages_ = comes ? pages_ + 1 : pages_ - std::min<uint64_t>(pages_, 1);
      leave_ = !comes;
      return {.status = 204};
    }
    return refusal(404);
  }

  HttpAnswer bytes(const HttpRequest& request)
  {
    const bool isFirst = request.match.empty();
    if (isFirst && file_.hasChanged() && !file_.open())
    {
      return refusal(404);
    }
    if (!isFirst && (file_.hasChanged() || request.match != file_.tag()))
    {
      return refusal(412);
    }
    HttpRange range{0, file_.size() - 1};
    HttpAnswer answer{.type = "application/octet-stream", .more = file_.size()};
    answer.fields = {{"ETag", file_.tag()}, {"Accept-Ranges", "bytes"}};
    if (!request.range.empty())
    {
      const std::string ofAll = "/" + std::to_string(file_.size());
      if (const int status = readRange(request.range, file_.size(), range); status != 0)
      {
        HttpAnswer no = refusal(status);
        no.fields.emplace_back("Content-Range", "bytes *" + ofAll);
        return no;
      }
      answer.status = 206;
      answer.more = range.last - range.first + 1;
      answer.fields.emplace_back("Content-Range",
                                 "bytes " + std::to_string(range.first) + "-" + std::to_string(range.last) + ofAll);
    }
    answer.fill = [this, from = range.first](uint64_t offset, std::span<char> to) {
      return file_.read(from + offset, to);
    };
    return answer;
  }

  HttpServer server_{};
  std::string token_ = newToken();
  std::string once_ = newToken();
  ViewedFile file_;
  ViewPage page_;
  uint64_t pages_ = 0;
  bool leave_ = false; ///< the last that was said was a goodbye
};

/// Refuses what is no stream before a browser is started for it.
void requireStream(const std::string& path)
{
  if (path == "-")
  {
    throw Failure("view: a FILE has to be there while one looks at it, which standard input is not");
  }
  Stream stream{ByteSource::open(path), {}};
  stream.recognition = recognise(stream.bytes(), {});
  stream.kind = otherKindOf(stream.bytes(), stream.recognition);
  if (!stream.isStream())
  {
    throw Failure(kTooDamaged, noStream(stream));
  }
}

int run(const Invocation& invocation)
{
  const std::string& path = invocation.arguments().at(0);
  requireStream(path);
  View view(invocation, path);
  const host::CaughtInterrupt caught;
  Output out("-");
  out.write(view.address() + "\n");
  out.flush();
  std::optional<host::Browser> browser;
  if (!invocation.has("--no-open"))
  {
    browser.emplace(view.addressOnce());
  }
  while (!host::CaughtInterrupt::hasCome() && !view.isLeft())
  {
    view.serve();
    if (browser && browser->hasFailed())
    {
      report("no browser could be started; open the address in one");
      browser.reset();
    }
  }
  out.commit();
  return kFine;
}

const Registration registration{{
    .place = 125,
    .name = "view",
    .arguments = "FILE",
    .summary = "the file in a browser: tree, values, bytes, check, table",
    .description =
        "Prints an address and opens a browser there, the one that BROWSER names or else that of the desktop. It is\n"
        "an address of this machine alone that nobody can guess: who has it can read FILE, and nothing else, until\n"
        "the program ends. It does when the page has been closed, or at an interrupt, with exit status 0.\n\n"
        "The page is tav.html, which is installed with the program in share/tav; the same file, opened from the disk,\n"
        "does without the program.",
    .options = {{.names = "--no-open", .help = "start no browser"},
                {.names = "--page", .kind = ValueKind::input, .value = "HTML", .help = "take the page from here"}},
    .concerns = kNoConcern,
    .examples = {{"tav view x.tav", "look into a file"},
                 {"tav view --no-open x.tav", "the address alone, for a browser at the other end of ssh -L"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
