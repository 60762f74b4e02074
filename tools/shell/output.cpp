#include "tools/shell/output.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <optional>
#include <utility>

#include "kor/host.h"
#include "tools/shell/report.h"

namespace tav::tool
{

namespace
{

constexpr size_t kBuffer = size_t{64} * 1024;

/// Whether the path leads to something that is no file: a device, a pipe.
bool isSpecial(const std::string& path)
{
  std::error_code error;
  const auto status = std::filesystem::status(kor::pathOf(path), error);
  return !error && std::filesystem::exists(status) && !std::filesystem::is_regular_file(status);
}

/// Throws Failure when a file of this name is there and `force` is not given.
void checkWritable(const std::string& path, bool force)
{
  std::error_code error;
  if (path == "-" || force)
  {
    return;
  }
  if (std::filesystem::is_directory(kor::pathOf(path), error))
  {
    failAt(path, KOR_RC_IS_FOLDER);
  }
  if (std::filesystem::is_regular_file(kor::pathOf(path), error))
  {
    failAt(path, KOR_RC_FILE_EXISTS, "--force replaces it");
  }
}

struct NamedOutput
{
  std::string option;
  std::string path;
};

/// Where a path leads to, also when nothing is there yet: links are followed, even those that lead to nothing.
std::filesystem::path targetOf(const std::string& text)
{
  constexpr int mostLinks = 40;
  std::error_code error;
  std::filesystem::path path = std::filesystem::absolute(kor::pathOf(text), error);
  for (int i = 0; i < mostLinks && std::filesystem::is_symlink(path, error); ++i)
  {
    path = path.parent_path() / std::filesystem::read_symlink(path, error);
  }
  const std::filesystem::path whole = std::filesystem::weakly_canonical(path, error);
  return error ? path : whole;
}

bool isSameFile(const std::string& first, const std::string& second)
{
  std::error_code error;
  if (first == "-" || second == "-")
  {
    return first == second;
  }
  if (std::filesystem::is_character_file(kor::pathOf(first), error))
  {
    return false; // a terminal and /dev/null serve any number of ends
  }
  return std::filesystem::equivalent(kor::pathOf(first), kor::pathOf(second), error) ||
         targetOf(first) == targetOf(second);
}

std::vector<NamedOutput> outputsOf(const Invocation& invocation)
{
  std::vector<NamedOutput> outputs;
  for (const auto* list : {&invocation.command().options, &globalOptions()})
  {
    for (const OptionSpec& option : *list)
    {
      const std::string name = longName(option);
      const std::string path = option.kind == ValueKind::file ? invocation.text(name) : std::string();
      const bool standardError = name == "--trace" && path == "-";
      if (!path.empty() && !standardError)
      {
        outputs.push_back({name, path});
      }
    }
  }
  return outputs;
}

/// The files that a command reads. Standard input has a name on most systems, which tells when it comes from a file.
std::vector<std::string> inputsOf(const Invocation& invocation)
{
  std::vector<std::string> inputs = invocation.arguments();
  inputs.resize(std::min(invocation.command().inputs, std::max<size_t>(inputs.size(), 1)), "-");
  std::replace(inputs.begin(), inputs.end(), std::string("-"), std::string("/dev/stdin"));
  return inputs;
}

} // namespace

void checkOutputs(const Invocation& invocation)
{
  const std::string& command = invocation.command().name;
  const std::vector<NamedOutput> outputs = outputsOf(invocation);
  const std::vector<std::string> inputs = inputsOf(invocation);
  for (auto output = outputs.begin(); output != outputs.end(); ++output)
  {
    const auto isSame = [&](const std::string& other) { return isSameFile(output->path, other); };
    const auto taken = std::find_if(outputs.begin(), output, [&](const auto& other) { return isSame(other.path); });
    if (taken != output)
    {
      throw Failure(command + ": " + taken->option + " and " + output->option + " lead to the same place, " +
                        (output->path == "-" ? "standard output" : "'" + output->path + "'"),
                    "each of them needs a file of its own, also with --force");
    }
    if (std::any_of(inputs.begin(), inputs.end(), isSame))
    {
      throw Failure(command + ": " + output->option + " '" + output->path + "' is a file that is read",
                    "write to another one; --force does not replace what is being read");
    }
    checkWritable(output->path, invocation.has("--force"));
  }
}

void failAtStandardOutput(int error)
{
  if (error == EPIPE)
  {
    throw ClosedPipe{};
  }
  failAt("standard output", error == ENOSPC  ? KOR_RC_NO_SPACE
                            : error == EFBIG ? KOR_RC_FILE_TOO_LARGE
                                             : KOR_RC_IO_ERROR);
}

bool wantsColour(const Invocation& invocation)
{
  const std::string when = invocation.text("--color", "auto");
  if (when != "auto")
  {
    return when == "always";
  }
  const auto variable = [](const char* name) {
    const char* const value = std::getenv(name);
    return std::string(value == nullptr ? "" : value);
  };
  return kor::isTerminal(stdout) && variable("NO_COLOR").empty() && variable("TERM") != "dumb";
}

Output::Output(std::string path, bool force)
    : path_(std::move(path)), force_(force), standard_(path_ == "-")
{
  if (!standard_)
  {
    checkWritable(path_, force);
    openFile(force);
  }
}

void Output::openFile(bool)
{
  const bool special = isSpecial(path_);
  for (unsigned attempt = 0;; ++attempt)
  {
    const std::string name =
        special ? path_ : path_ + ".tav-" + std::to_string(kor::processId()) + "-" + std::to_string(attempt);
    KORFileOpenParam param;
    param.pPath = name.c_str();
    param.options = special ? KOR_FILE_WRITE : KOR_FILE_WRITE | KOR_FILE_CREATE | KOR_FILE_EXCLUSIVE;
    std::optional<kor::HeldInterrupts> held;
    if (!special) // a pipe may let an open wait for ever
    {
      held.emplace();
    }
    const uint32_t code = file_.open(&param);
    if (code == TAV_RC_OK)
    {
      temporary_ = special ? std::string() : name;
      kor::removeOnInterrupt(temporary_);
      return;
    }
    if (code != KOR_RC_FILE_EXISTS || attempt == 1000)
    {
      failAt(path_, code);
    }
  }
}

Output::~Output()
{
  if (standard_)
  {
    // What was printed before a failure is still worth reading; a second failure has nobody to tell.
    std::fwrite(buffer_.data(), 1, buffer_.size(), stdout);
    std::fflush(stdout);
    return;
  }
  file_.close();
  if (!temporary_.empty())
  {
    kor::removeFile(temporary_);
    kor::removeOnInterrupt({});
  }
}

void Output::writeOut(const char* bytes, size_t count)
{
  if (count == 0)
  {
    return;
  }
  if (!standard_)
  {
    KORFileWriteParam param;
    param.pData = bytes;
    param.length = count;
    uint64_t done = 0;
    if (const uint32_t code = file_.write(&param, &done); code != TAV_RC_OK)
    {
      failAt(path_, code);
    }
    return;
  }
  errno = 0;
  if (std::fwrite(bytes, 1, count, stdout) != count || std::fflush(stdout) != 0)
  {
    const int error = errno;
    buffer_.clear();
    failAtStandardOutput(error);
  }
}

void Output::write(std::string_view text)
{
  written_ += text.size();
  if (buffer_.size() + text.size() > kBuffer)
  {
    flush();
  }
  if (text.size() > kBuffer)
  {
    writeOut(text.data(), text.size());
    return;
  }
  buffer_ += text;
}

void Output::write(std::span<const uint8_t> bytes)
{
  write(std::string_view(reinterpret_cast<const char*>(bytes.data()), bytes.size()));
}

void Output::flush()
{
  // Taken out first: what failed once is not written again when the object goes.
  const std::string pending = std::exchange(buffer_, {});
  writeOut(pending.data(), pending.size());
}

void Output::commit()
{
  flush();
  if (standard_)
  {
    return;
  }
  if (const uint32_t code = file_.close(); code != TAV_RC_OK)
  {
    failAt(path_, code);
  }
  if (temporary_.empty())
  {
    return;
  }
  if (const uint32_t code = kor::moveIntoPlace(temporary_, path_, force_); code != TAV_RC_OK)
  {
    failAt(path_, code, code == KOR_RC_FILE_EXISTS ? "--force replaces it" : "");
  }
  temporary_.clear();
  kor::removeOnInterrupt({});
}

} // namespace tav::tool
