// The reading half of tav_c.h: opening, walking, searching.
#include "inspect/c/reader.h"

#include "inspect/c/node.h"
#include "tav/byteOrder.h"
#include "tav/inspect/locate.hpp"

using namespace tav;
using namespace tav::inspect;

namespace tav::inspect
{

std::optional<FormChoice> choiceOf(const tav_form* form)
{
  FormChoice choice;
  if (form == nullptr)
  {
    return choice;
  }
  if (form->byte_order > 2 || form->aligned > 2 ||
      !(form->root_bits == 0 || form->root_bits == 32 || form->root_bits == 64))
  {
    return std::nullopt;
  }
  if (form->byte_order != 0)
  {
    choice.swapped = (form->byte_order == 1) != kor::isLittleEndian;
  }
  if (form->root_bits != 0)
  {
    choice.root64 = form->root_bits == 64;
  }
  if (form->aligned != 0)
  {
    choice.aligned = form->aligned == 2;
  }
  return choice;
}

namespace
{

/// Opens what `make` makes of the options that a form gives.
template<class Make>
uint32_t openReader(const tav_form* form, tav_reader** out, Make&& make)
{
  if (out == nullptr)
  {
    return TAV_RC_BAD_PARAM;
  }
  *out = nullptr;
  return guarded(nullptr, [&] {
    const auto choice = choiceOf(form);
    if (!choice)
    {
      return uint32_t{TAV_RC_BAD_PARAM};
    }
    *out = new tav_reader(make(DocumentOptions{.form = *choice}));
    return uint32_t{TAV_RC_OK};
  });
}

/// Reads the node behind `reference` in its group, or the first one. End elements are passed over.
uint32_t step(const tav_reader& reader, PlacedNode& placed, bool isFirst, tav_node& out)
{
  DocumentState& state = reader.state();
  TAVHandle* const handle = state.readerOf(placed.form).handle();
  TAVHeaderData data{};
  data.header = placed.header;
  uint32_t rc = TAV_RC_OK;
  do
  {
    TAVHeader reference = data.header;
    TAVHeaderData next{};
    rc = tavGetNextChild(0, handle, &placed.parent, isFirst ? nullptr : &reference, &next);
    const uint64_t end = layout::addSaturated(payloadOffset(next.header), layout::sizeOf(next.header));
    if (rc == TAV_RC_DATA_TOO_LARGE && next.header.hdrType != 0 && end <= state.source->size())
    {
      next.pDataBuf = nullptr; // whole, but larger than the ring
      rc = TAV_RC_OK;
    }
    data = next;
    isFirst = false;
  } while (rc == TAV_RC_OK && layout::isEndElement(layout::elmOf(data.header)));
  if (rc == TAV_RC_OK)
  {
    placed.header = data.header;
    give(reader, placed, layout::isGroup(data.header) ? nullptr : data.pDataBuf, out);
  }
  return rc;
}

/// Keeps what a step has failed with; that a level has ended is no failure.
uint32_t told(const tav_reader& reader, uint32_t rc, uint64_t offset)
{
  if (rc != TAV_RC_OK && rc != TAV_RC_NO_MORE_CHILDREN)
  {
    reader.failure.set(Problem{.file = reader.state().source->name(),
                               .offset = offset,
                               .sentence = "the step from this node fails: " + std::string(codeSentence(rc)),
                               .code = rc});
    reader.failure.wantsPath = true;
  }
  return rc;
}

uint32_t refuse(const tav_reader& reader)
{
  return failed(reader.failure, TAV_RC_BAD_PARAM, "an argument is null, or a node of another reader");
}

/// Searches, and hands each node to `visit` until it returns false.
template<class Visit>
uint32_t search(tav_reader& reader, const tav_node* from, const char* path, Visit&& visit)
{
  PlacedNode start;
  if (path == nullptr || (from != nullptr && !take(reader, *from, start)))
  {
    return refuse(reader);
  }
  std::optional<Search> matches;
  if (from != nullptr)
  {
    matches.emplace(reader.state(), SearchStart{start.header, start.form}, path, OnDamage::stop);
  }
  else
  {
    matches.emplace(reader.state(), path, OnDamage::stop);
  }
  bool isFound = false;
  while (matches->next())
  {
    isFound = true;
    tav_node node{};
    // The search begins at the node, whose parent it does not see.
    const bool isStart = from != nullptr && matches->found().offset() == start.header.nodeOffset;
    const TAVHeader parent = isStart ? start.parent : matches->parent();
    give(reader, PlacedNode{matches->found().header, parent, matches->form()}, nullptr, node);
    if (!visit(node))
    {
      break;
    }
  }
  return isFound ? TAV_RC_OK : TAV_RC_NOT_FOUND;
}

/// The next root behind another one. Damage in between throws.
uint32_t nextRoot(tav_reader& reader, const PlacedNode* after, tav_node& out)
{
  DocumentState& state = reader.state();
  const auto stop = [&state](const PassedOver& passed) {
    throw Error(Problem{.file = state.source->name(),
                        .offset = passed.offset,
                        .path = passed.path,
                        .sentence = passed.reason,
                        .code = passed.code});
  };
  Form form = after != nullptr ? after->form : state.recognition.form;
  WalkStart start;
  if (after != nullptr)
  {
    start = {.offset = after->header.nodeOffset, .wide = layout::is64(after->header)};
  }
  StreamWalk walk(*state.source, form, stop, start);
  Event event;
  for (bool isPast = after == nullptr; walk.next(event);)
  {
    if (event.what != What::nodeBegin || event.depth != 0)
    {
      continue;
    }
    if (isPast)
    {
      give(reader, PlacedNode{event.node.header, {}, walk.form()}, nullptr, out);
      return TAV_RC_OK;
    }
    isPast = true;
    walk.skip();
  }
  return TAV_RC_NO_MORE_CHILDREN;
}

} // namespace

} // namespace tav::inspect

uint32_t tav_open_file(const char* path, const tav_form* form, tav_reader** out)
{
  return openReader(form, out, [path](const DocumentOptions& options) {
    if (path == nullptr)
    {
      throw Error("no path was given");
    }
    return Document(ByteSource::open(path, options.ringBytes), options);
  });
}

uint32_t tav_open_memory(const void* bytes, size_t size, const tav_form* form, tav_reader** out)
{
  return openReader(form, out, [bytes, size](const DocumentOptions& options) {
    if (bytes == nullptr)
    {
      throw Error("no bytes were given");
    }
    return Document(std::span(static_cast<const std::byte*>(bytes), size), options);
  });
}

void tav_close(tav_reader* reader)
{
  delete reader;
}

uint32_t tav_form_of(const tav_reader* reader, tav_form* out)
{
  if (reader == nullptr || out == nullptr)
  {
    return TAV_RC_BAD_PARAM;
  }
  const Form& form = reader->document.form();
  out->byte_order = form.swapped != kor::isLittleEndian ? 1 : 2;
  out->root_bits = form.root64 ? 64 : 32;
  out->aligned = form.aligned ? 2 : 1;
  return TAV_RC_OK;
}

uint32_t tav_reader_dictionary(tav_reader* reader, const char* path)
{
  if (reader == nullptr)
  {
    return TAV_RC_BAD_PARAM;
  }
  return guarded(&reader->failure, [=] {
    if (path == nullptr)
    {
      throw Error("no path was given");
    }
    DocumentState& state = reader->state();
    const Dictionary both = state.source->dictionary().with(Dictionary::open(path));
    state.options.dictionary = both;
    state.source->setDictionary(both);
    return uint32_t{TAV_RC_OK};
  });
}

const char* tav_last_message(const tav_reader* reader)
{
  if (reader == nullptr || !reader->failure.isThere)
  {
    return "";
  }
  Failed& failure = reader->failure;
  const uint32_t rc = guarded(nullptr, [&] {
    if (std::exchange(failure.wantsPath, false))
    {
      failure.problem.path = reader->state().pathAt(failure.problem.offset.value_or(0), PathStyle::brief);
    }
    failure.text = problemLine(failure.problem);
    return uint32_t{TAV_RC_OK};
  });
  return rc == TAV_RC_OK ? failure.text.c_str() : tav_message(rc);
}

uint32_t tav_next_root(tav_reader* reader, const tav_node* after, tav_node* out)
{
  if (reader == nullptr)
  {
    return TAV_RC_BAD_PARAM;
  }
  return guarded(&reader->failure, [&] {
    PlacedNode placed;
    const bool isFine = out != nullptr && (after == nullptr || take(*reader, *after, placed));
    return isFine ? nextRoot(*reader, after != nullptr ? &placed : nullptr, *out) : refuse(*reader);
  });
}

uint32_t tav_first_child(tav_reader* reader, const tav_node* group, tav_node* out)
{
  if (reader == nullptr)
  {
    return TAV_RC_BAD_PARAM;
  }
  return guarded(&reader->failure, [&] {
    PlacedNode placed;
    if (group == nullptr || out == nullptr || !take(*reader, *group, placed))
    {
      return refuse(*reader);
    }
    if (!layout::isGroup(placed.header))
    {
      return uint32_t{TAV_RC_NO_MORE_CHILDREN};
    }
    const uint64_t offset = group->offset; // which may be in `out`
    placed.parent = placed.header;
    return told(*reader, step(*reader, placed, true, *out), offset);
  });
}

uint32_t tav_next_sibling(tav_reader* reader, const tav_node* node, tav_node* out)
{
  if (reader == nullptr)
  {
    return TAV_RC_BAD_PARAM;
  }
  return guarded(&reader->failure, [&] {
    PlacedNode placed;
    if (node == nullptr || out == nullptr || !take(*reader, *node, placed))
    {
      return refuse(*reader);
    }
    if (placed.parent.hdrType == 0)
    {
      return uint32_t{TAV_RC_NO_MORE_CHILDREN};
    }
    const uint64_t offset = node->offset;
    return told(*reader, step(*reader, placed, false, *out), offset);
  });
}

uint32_t tav_find(tav_reader* reader, const tav_node* from, const char* path, tav_node* out)
{
  if (reader == nullptr)
  {
    return TAV_RC_BAD_PARAM;
  }
  return guarded(&reader->failure, [&] {
    if (out == nullptr)
    {
      return refuse(*reader);
    }
    return search(*reader, from, path, [out](const tav_node& node) {
      *out = node;
      return false;
    });
  });
}

uint32_t tav_find_each(tav_reader* reader, const tav_node* from, const char* path,
                       int (*visit)(const tav_node* node, void* context), void* context)
{
  if (reader == nullptr)
  {
    return TAV_RC_BAD_PARAM;
  }
  return guarded(&reader->failure, [&] {
    if (visit == nullptr)
    {
      return refuse(*reader);
    }
    return search(*reader, from, path, [=](const tav_node& node) { return visit(&node, context) == 0; });
  });
}
