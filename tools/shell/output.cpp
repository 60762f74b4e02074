#include "tools/shell/output.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <utility>

#include "tools/host/host.h"
#include "tools/shell/report.h"

namespace tav::tool
{

namespace
{

constexpr size_t kBuffer = size_t{64} * 1024;

/// "-" for every name of standard output.
std::string plainName(const std::string& path)
{
  return isStandardOutput(path) ? "-" : path;
}

/// Whether a path leads to something that can only be written to where it is: a device, a pipe, and what is no name of
/// a folder, but a link of the system to a file that some process has open.
bool isInPlace(const std::string& path, const std::filesystem::path& target)
{
  std::error_code error;
  const auto status = std::filesystem::status(host::pathOf(path), error);
  const bool known = !error && std::filesystem::exists(status);
  return known && (!std::filesystem::is_regular_file(status) || std::filesystem::is_symlink(target, error));
}

/// The name of a file beside the target that nobody has; `attempt` distinguishes them. Long names are cut, since a
/// system allows 255 bytes or less.
std::string besideName(const std::filesystem::path& target, unsigned attempt)
{
  constexpr size_t most = 100;
  std::string name = host::textOf(target.filename());
  size_t end = std::min(most, name.size());
  while (end != 0 && end < name.size() && (static_cast<unsigned char>(name[end]) & 0xC0) == 0x80)
  {
    --end; // no character is divided
  }
  name.resize(end);
  return host::textOf(target.parent_path() /
                      host::pathOf(name + ".tav-" + std::to_string(host::processId()) + "-" + std::to_string(attempt)));
}

/// Throws Failure when a file of this name is there and `force` is not given.
void checkWritable(const std::string& path, bool force)
{
  std::error_code error;
  if (force || path == "-" || host::ownFile(path))
  {
    return;
  }
  if (std::filesystem::is_directory(host::pathOf(path), error))
  {
    failAt(path, KOR_RC_IS_FOLDER);
  }
  if (std::filesystem::is_regular_file(host::pathOf(path), error))
  {
    failAt(path, KOR_RC_FILE_EXISTS, "--force replaces it");
  }
}

struct NamedOutput
{
  std::string option;
  std::string path;
};

bool isSameFile(const std::string& first, const std::string& second)
{
  std::error_code error;
  if (first != "-" && std::filesystem::is_character_file(host::pathOf(first), error))
  {
    return false; // a terminal and /dev/null serve any number of ends
  }
  if (first == "-" || second == "-")
  {
    return plainName(first) == plainName(second);
  }
  return std::filesystem::equivalent(host::pathOf(first), host::pathOf(second), error) ||
         host::targetOf(first) == host::targetOf(second);
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

/// The files that a command reads. Standard input has a name on most systems, which shows when it comes from a file.
std::vector<std::string> inputsOf(const Invocation& invocation)
{
  std::vector<std::string> inputs = invocation.arguments();
  inputs.resize(std::min(invocation.command().inputs, std::max<size_t>(inputs.size(), 1)), "-");
  for (const auto* list : {&invocation.command().options, &globalOptions()})
  {
    for (const OptionSpec& option : *list)
    {
      const auto read = option.kind == ValueKind::input ? invocation.all(longName(option)) : std::vector<std::string>();
      inputs.insert(inputs.end(), read.begin(), read.end());
    }
  }
  std::replace(inputs.begin(), inputs.end(), std::string("-"), std::string("/dev/stdin"));
  return inputs;
}

/// Whether a command goes on at the end of its output, so that an existing one is not replaced.
bool appends(const Invocation& invocation)
{
  const std::vector<OptionSpec>& options = invocation.command().options;
  const auto isIt = [](const OptionSpec& option) { return longName(option) == "--append"; };
  return std::any_of(options.begin(), options.end(), isIt) && invocation.has("--append");
}

} // namespace

bool isStandardOutput(const std::string& path)
{
  return path == "-" || host::ownFile(path) == 1;
}

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
    const bool stays = output->option == "--output" && appends(invocation);
    checkWritable(output->path, stays || invocation.has("--force"));
  }
}

namespace
{

uint32_t codeOfWrite(int error)
{
  return error == ENOSPC  ? KOR_RC_NO_SPACE
         : error == EFBIG ? KOR_RC_FILE_TOO_LARGE
                          : KOR_RC_IO_ERROR;
}

} // namespace

Status printText(std::string_view text)
{
  Output out("-");
  out.write(text);
  out.commit();
  return kFine;
}

void failAtStandardOutput(int error)
{
  if (error == EPIPE)
  {
    throw ClosedPipe{};
  }
  failAt("standard output", codeOfWrite(error));
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
  return host::isTerminal(stdout) && variable("NO_COLOR").empty() && variable("TERM") != "dumb";
}

Output::Output(const std::string& path, bool force)
    : path_(plainName(path)), force_(force)
{
  if (path_ == "-")
  {
    stream_ = stdout;
    return;
  }
  checkWritable(path_, force);
  const std::filesystem::path target = host::targetOf(path_);
  target_ = host::textOf(target);
  std::error_code error;
  if (std::filesystem::is_symlink(target, error) && !std::filesystem::exists(target, error))
  {
    failAt(path_, KOR_RC_BAD_NAME, "its links lead to each other");
  }
  isInPlace(path_, target) ? openInPlace() : openBeside();
}

void Output::openInPlace()
{
  uint32_t code = TAV_RC_OK;
  if (host::ownFile(path_))
  {
    stream_ = host::openStream(path_, "wb", code);
  }
  else
  {
    // Of another process's open file nothing that was in it stays behind the output.
    std::error_code error;
    const bool regular = std::filesystem::is_regular_file(host::pathOf(path_), error);
    KORFileOpenParam param;
    param.pPath = path_.c_str();
    param.options = regular ? KOR_FILE_WRITE | KOR_FILE_TRUNCATE : KOR_FILE_WRITE;
    code = file_.open(&param);
  }
  if (code != TAV_RC_OK)
  {
    failAt(path_, code);
  }
}

void Output::openBeside()
{
  for (unsigned attempt = 0;; ++attempt)
  {
    const std::string name = besideName(host::pathOf(target_), attempt);
    KORFileOpenParam param;
    param.pPath = name.c_str();
    param.options = KOR_FILE_WRITE | KOR_FILE_CREATE | KOR_FILE_EXCLUSIVE;
    param.permissions = 0600; // until it has its name, it is nobody else's
    const host::HeldInterrupts held;
    const uint32_t code = file_.open(&param);
    if (code == TAV_RC_OK)
    {
      temporary_ = name;
      host::removeOnInterrupt(temporary_);
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
  if (stream_ != nullptr)
  {
    // What was printed before a failure is still worth reading; a second failure has nobody to tell.
    std::fwrite(buffer_.data(), 1, buffer_.size(), stream_);
    stream_ == stdout ? std::fflush(stream_) : std::fclose(stream_);
    return;
  }
  file_.close();
  if (!temporary_.empty())
  {
    host::removeFile(temporary_);
    host::keepOnInterrupt(temporary_);
  }
}

void Output::failAtStream(int error)
{
  buffer_.clear();
  if (stream_ == stdout)
  {
    failAtStandardOutput(error);
  }
  failAt(path_, codeOfWrite(error));
}

void Output::writeOut(const char* bytes, size_t count)
{
  if (count == 0)
  {
    return;
  }
  if (stream_ == nullptr)
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
  if (std::fwrite(bytes, 1, count, stream_) != count || std::fflush(stream_) != 0)
  {
    failAtStream(errno);
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
  std::string pending;
  pending.swap(buffer_);
  writeOut(pending.data(), pending.size());
  pending.clear();
  buffer_.swap(pending); // its room is needed again
}

void Output::commit()
{
  flush();
  if (stream_ != nullptr)
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
  if (const uint32_t code = host::moveIntoPlace(temporary_, target_, force_); code != TAV_RC_OK)
  {
    failAt(path_, code, code == KOR_RC_FILE_EXISTS ? "--force replaces it" : "");
  }
  host::keepOnInterrupt(temporary_);
  temporary_.clear();
}

} // namespace tav::tool
