#include "tav/inspect/edit.hpp"

#include <algorithm>
#include <vector>

#include "inspect/edit/payload.h"
#include "inspect/edit/places.h"
#include "inspect/edit/rewriter.h"
#include "inspect/json/encoder.h"
#include "inspect/path/selection.h"
#include "tav/inspect/jsonText.hpp"
#include "tav/inspect/phrases.hpp"
#include "tav/inspect/problem.hpp"

namespace tav::inspect
{

using namespace tav::layout;

namespace
{

void seek(KORHFile& file, const std::string& name, uint64_t offset)
{
  KORFileSeekParam param;
  param.offset = offset;
  if (const uint32_t code = file.seek(&param, nullptr); code != TAV_RC_OK)
  {
    failAt(name, code);
  }
}

/// Opens a file to be written into, and nobody else's meanwhile.
void openAlone(const std::string& path, KORHFile& file)
{
  KORFileOpenParam open;
  open.pPath = path.c_str();
  open.options = KOR_FILE_UPDATE;
  KORFileLockParam lock;
  lock.word1 = 1; // nobody else's
  lock.word2 = 2; // without waiting
  uint32_t code = file.open(&open);
  code = code == TAV_RC_OK ? file.lock(&lock) : code;
  if (code != TAV_RC_OK)
  {
    failAt(path, code);
  }
}

} // namespace

class Editor::Work
{
public:
  Work(ByteSource& source, const Form& form, std::span<const Assignment> assignments, const EditOptions& options)
      : source_(source), form_(form), name_(source.name()), from_(source.from()), type_(options.type),
        places_(options.makeFile)
  {
    std::vector<Path> paths;
    for (const Assignment& assignment : assignments)
    {
      values_.push_back(assignment.value);
      paths.push_back(assignment.path);
    }
    find(paths, options.seen);
  }

  void requireSameSizes() const
  {
    if (resized_)
    {
      throw Error(*resized_);
    }
  }

  void writeInto(KORHFile& file);
  void writeNew(PatchFile& out, const std::function<void(uint64_t)>& progress)
  {
    const auto payload = [this](const EditPlace& place) { return payloadOf(place); };
    Rewriter(source_, form_, places_, payload, out).run(progress);
  }

  uint64_t unchanged = 0;

  uint64_t changed() const { return places_.count(); }

private:
  void find(const std::vector<Path>& paths, const std::function<void(const Walker&, const Event&)>& seen);
  void take(const Walker& walker, const Event& event, size_t assignment);
  std::string judgedPayload(const Problem& where, const EditPlace& place) const;
  std::string payloadOf(const EditPlace& place) const
  {
    return payloadOfText(values_[place.assignment], place.type, place.codePage, form_.swapped);
  }
  bool hasPayload(const Node& node, const std::string& payload);
  void requireThere(KORHFile& file, const EditPlace& place) const;
  void write(KORHFile& file, uint64_t offset, std::span<const uint8_t> bytes) const;

  ByteSource& source_;
  Form form_;
  std::string name_;
  uint64_t from_;
  std::optional<uint16_t> type_;
  std::vector<std::string> values_{};
  EditPlaces places_;
  std::optional<Problem> resized_{}; ///< the first node whose payload does not keep its size
};

void Editor::Work::find(const std::vector<Path>& paths, const std::function<void(const Walker&, const Event&)>& seen)
{
  Selection selection(paths);
  Walker walker(source_, form_);
  for (Event event; walker.next(event);)
  {
    if (seen)
    {
      seen(walker, event);
    }
    if (event.what != What::nodeBegin)
    {
      continue;
    }
    if (const auto assignment = selection.at(walker, event))
    {
      take(walker, event, *assignment);
    }
    else if (event.node.isGroup() && !selection.reachesBelow())
    {
      walker.skip();
    }
  }
  for (size_t i = 0; i < paths.size(); ++i)
  {
    if (selection.found(i) == 0)
    {
      throw Error(noMatch(paths[i], name_), Trouble::notFound);
    }
  }
}

void Editor::Work::take(const Walker& walker, const Event& event, size_t assignment)
{
  const Node& node = event.node;
  Problem where{.file = name_, .offset = event.offset, .path = walker.path(event, PathStyle::brief)};
  if (node.isGroup() || isEndElement(node.elm()))
  {
    where.sentence = node.isGroup() ? "is a group, which has no value of its own"
                                    : "only ends a group, and follows from what is in it";
    throw Error(where);
  }
  EditPlace place;
  place.offset = event.offset;
  place.headerLength = static_cast<uint32_t>(node.headerLength());
  place.assignment = static_cast<uint32_t>(assignment);
  place.type = type_.value_or(node.type());
  place.codePage = kUsualCodePage;
  source_.read(place.offset, std::span(place.header).first(place.headerLength));
  if (node.type() == TAV_TYPE_UTF8_STRING && place.type == node.type() && node.size() >= 2)
  {
    source_.read(place.payload(), std::span(reinterpret_cast<uint8_t*>(&place.codePage), sizeof place.codePage));
    place.codePage = form_.swapped ? kor::byteswap16(place.codePage) : place.codePage;
  }
  const std::string payload = judgedPayload(where, place);
  if (place.type == node.type() && hasPayload(node, payload))
  {
    ++unchanged;
    return;
  }
  if (payload.size() != node.size() && !resized_)
  {
    where.sentence = "the new value takes " + counted(payload.size(), "byte") + " where " +
                     std::to_string(node.size()) + (node.size() == 1 ? " is" : " are");
    where.hint = "-o OUT writes a new file";
    resized_ = std::move(where);
  }
  places_.add(place);
}

std::string Editor::Work::judgedPayload(const Problem& where, const EditPlace& place) const
{
  try
  {
    return payloadOf(place);
  }
  catch (const BuildError& error)
  {
    Problem problem = where;
    problem.sentence = error.what();
    throw Error(problem);
  }
}

bool Editor::Work::hasPayload(const Node& node, const std::string& payload)
{
  if (payload.size() != node.size())
  {
    return false;
  }
  std::string there(payload.size(), '\0');
  there.resize(source_.read(node.payloadOffset(), std::span(reinterpret_cast<uint8_t*>(there.data()), there.size())));
  return there == payload;
}

void Editor::Work::requireThere(KORHFile& file, const EditPlace& place) const
{
  seek(file, name_, from_ + place.offset);
  std::array<uint8_t, kHeaderSize64> header{};
  KORFileReadParam param;
  param.length = place.headerLength;
  uint64_t done = 0;
  const uint32_t code = file.read(&param, header.data(), &done);
  if (code != TAV_RC_OK && code != TAV_RC_END_OF_STORAGE)
  {
    failAt(name_, code);
  }
  if (done != place.headerLength || header != place.header)
  {
    throw Error(Problem{.file = name_,
                        .offset = place.offset,
                        .sentence = "another node stands here than a moment ago: the file changed",
                        .hint = "nothing was written"});
  }
}

void Editor::Work::write(KORHFile& file, uint64_t offset, std::span<const uint8_t> bytes) const
{
  seek(file, name_, from_ + offset);
  KORFileWriteParam param;
  param.pData = bytes.data();
  param.length = bytes.size();
  uint64_t done = 0;
  if (const uint32_t code = bytes.empty() ? TAV_RC_OK : file.write(&param, &done); code != TAV_RC_OK)
  {
    failAt(name_, code);
  }
}

void Editor::Work::writeInto(KORHFile& file)
{
  requireSameSizes();
  for (uint64_t i = 0; i < places_.count(); ++i)
  {
    requireThere(file, places_.at(i));
  }
  for (uint64_t i = 0; i < places_.count(); ++i)
  {
    const EditPlace place = places_.at(i);
    TAVHeader header{};
    decodeHeader(place.header.data(), place.headerLength == kHeaderSize64, form_.swapped, header);
    is64(header) ? void(header.hdr64.type = place.type) : void(header.hdr32.type = place.type);
    std::array<uint8_t, kHeaderSize64> bytes{};
    encodeHeader(header, form_.swapped, bytes.data());
    const std::string payload = payloadOf(place);
    write(file, place.offset, std::span<const uint8_t>(bytes).first(place.headerLength));
    write(file, place.payload(), std::span(reinterpret_cast<const uint8_t*>(payload.data()), payload.size()));
  }
}

Editor::Editor(ByteSource& source, const Form& form, std::span<const Assignment> assignments,
               const EditOptions& options)
    : work_(std::make_unique<Work>(source, form, assignments, options))
{
}

Editor::~Editor() = default;

uint64_t Editor::changed() const
{
  return work_->changed();
}

uint64_t Editor::unchanged() const
{
  return work_->unchanged;
}

void Editor::requireSameSizes() const
{
  work_->requireSameSizes();
}

void Editor::writeInto(KORHFile& file)
{
  work_->writeInto(file);
}

void Editor::writeInPlace(const std::string& path)
{
  work_->requireSameSizes();
  KORHFile file;
  openAlone(path, file);
  work_->writeInto(file);
  uint32_t code = file.sync();
  code = code == TAV_RC_OK ? file.close() : code;
  if (code != TAV_RC_OK)
  {
    failAt(path, code);
  }
}

void Editor::writeNew(PatchFile& out, const std::function<void(uint64_t)>& progress)
{
  work_->writeNew(out, progress);
}

} // namespace tav::inspect
