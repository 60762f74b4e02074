#include "tools/shell/streamOutput.h"

#include <algorithm>
#include <vector>

#include "tools/host/host.h"
#include "tools/shell/report.h"

namespace tav::tool
{

namespace
{

void require(uint32_t code)
{
  if (code != TAV_RC_OK)
  {
    throw Error(Problem{.sentence = "the output cannot be written: " + std::string(codeSentence(code)), .code = code});
  }
}

} // namespace

std::string requireStreamOutput(const Invocation& invocation)
{
  const std::string& command = invocation.command().name;
  std::string output = invocation.text("--output");
  if (output.empty())
  {
    throw Failure(command + ": -o OUT is missing", "- is standard output");
  }
  if (isStandardOutput(output) && host::isTerminal(stdout))
  {
    throw Failure(command + ": a stream is no text for a terminal", "-o FILE writes it to a file");
  }
  return output;
}

StreamOutput::StreamOutput(Output& out)
    : out_(out)
{
  if (out.temporaryPath().empty())
  {
    bytes_.emplace(own_.emplace().file());
    return;
  }
  KORFileOpenParam param;
  param.pPath = out.temporaryPath().c_str();
  param.options = KOR_FILE_UPDATE;
  require(file_.open(&param));
  bytes_.emplace(file_);
}

void StreamOutput::copyOut()
{
  std::vector<uint8_t> block(size_t{256} * 1024);
  for (uint64_t at = 0; at < bytes_->length();)
  {
    const size_t count = bytes_->read(at, block);
    out_.write(std::span<const uint8_t>(block).first(count));
    at += count;
  }
}

void StreamOutput::finish()
{
  bytes_->flush();
  if (own_)
  {
    copyOut();
  }
  else
  {
    require(file_.close());
  }
  out_.commit();
}

} // namespace tav::tool
