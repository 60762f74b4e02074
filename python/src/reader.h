/// tav.Reader, its nodes, and walks over them.
#pragma once

#include <array>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <vector>

#include "python/src/input.h"
#include "python/src/pass.h"
#include "tav/cpp/decode.hpp"
#include "tav/inspect/document.hpp"

namespace tav::python
{

/// What a reader has open. Walks hold on to it, too, so that closing the reader takes nothing away under them.
struct Opened
{
  Opened(Input given, const inspect::FormChoice& choice, inspect::OnDamage atDamage);

  /// The exact reader for a form.
  const tav::Reader& readerOf(bool swapped, bool aligned);

  Input input;
  std::span<const uint8_t> bytes;
  inspect::OnDamage onDamage;
  Pass* pass = nullptr; ///< that searches now
  inspect::Document document;
  /// By walks beside the document's own: by offset and rule, the size.
  std::map<std::pair<uint64_t, inspect::RuleId>, uint64_t> passedOver{};

private:
  std::array<std::unique_ptr<tav::Reader>, 4> readers_{};
};

inspect::DocumentOptions documentOptions(const inspect::FormChoice& form, const inspect::Dictionary& dictionary);

/// What the layer's reader is told of a form.
StreamOptions layerOptions(bool swapped, bool aligned);

struct ReaderObject
{
  PyObject_HEAD
      std::shared_ptr<Opened>
          opened; ///< null: closed
  bool busy;      ///< a thread searches without the interpreter
};

struct NodeObject
{
  PyObject_HEAD
      ReaderObject* reader;
  NodeObject* parent;     ///< null: not known, or none
  const uint8_t* payload; ///< of a data element, while the reader is open; null: it is not whole
  uint64_t offset;
  uint64_t size;
  uint32_t info;
  uint16_t type;
  uint16_t elm;
  bool isWide;
  bool isGroup;
  bool isRoot;
  bool swapped;
  bool aligned;
};

/// What is open; a closed reader raises TavError.
Opened& use(const ReaderObject& reader);
/// The same for what searches: not while another thread, or the one that calls back, does.
Opened& useDocument(const ReaderObject& reader);

/// A search, for which the reader belongs to one thread while others run.
class Searching
{
public:
  Searching(ReaderObject& reader, PyObject* progress)
      : reader_(reader), opened_(*reader.opened)
  {
    reader_.busy = true;
    pass_.emplace(progress, opened_.bytes.size());
    opened_.pass = &*pass_;
  }
  Searching(const Searching&) = delete;
  Searching& operator=(const Searching&) = delete;
  ~Searching()
  {
    pass_->hold();
    opened_.pass = nullptr;
    reader_.busy = false;
  }
  Pass& pass() { return *pass_; }

private:
  ReaderObject& reader_;
  Opened& opened_;
  std::optional<Pass> pass_{};
};

/// A node of Python for one of the library; of an alike stream as the parent where there is one.
NodeObject* makeNode(ReaderObject& reader, const Opened& opened, const tav::Node& node, NodeObject* parent);
NodeObject* makeNode(ReaderObject& reader, const Opened& opened, const tav::Node& node, const inspect::Form& form);

/// The node as the layer has it.
tav::Node layerNode(Opened& opened, const NodeObject& node);

/// A walk over the children of a node.
PyObject* walkChildren(NodeObject& node);

/// A walk over what a path leads to; `from` null: from the roots. `parent` is that of all nodes found, where it is
/// known.
PyObject* walkFound(ReaderObject& reader, NodeObject* from, std::string path, NodeObject* parent, PyObject* progress);
/// The first of them, or None.
PyObject* findFirst(ReaderObject& reader, NodeObject* from, std::string path, PyObject* progress);

/// The value of a node, a new reference.
PyObject* nodeValue(const NodeObject& node);

/// A node of a walk below a root.
struct Step
{
  const TAVHeader& header;
  const uint8_t* payload; ///< of a data element; null: it is not whole
  uint64_t depth;         ///< 1: a child of the root
  bool isGroup;
  std::string* path; ///< where it is asked for

  uint16_t elm() const { return layout::elmOf(header); }
  tav::detail::RawValue raw(bool swapped) const
  {
    return {layout::typeOf(header), payload, layout::sizeOf(header), swapped};
  }
};

/// What `load` gives of a node, and of all roots.
PyObject* loadNode(NodeObject& node);
PyObject* loadRoots(ReaderObject& reader);

/// The columns of all nodes as Python makes arrays of them: see columns.cpp.
PyObject* columnsOf(ReaderObject& reader, bool withPaths, PyObject* progress);

/// The reader that an object is; TypeError for another one.
ReaderObject& readerObjectOf(PyObject* object);

/// Functions of the module about tables, and the parts of files that they are read by.
PyObject* readTable(PyObject* module, PyObject* arguments);
PyObject* readPart(PyObject* module, PyObject* arguments);
PyObject* plan(PyObject* module, PyObject* arguments);
PyObject* behindOf(PyObject* module, PyObject* arguments);
PyObject* holdsBehind(PyObject* module, PyObject* arguments);

void addReader(PyObject* module);
void addNode(PyObject* module);
void addWalks(PyObject* module);
void addColumns(PyObject* module);
void addWriter(PyObject* module);
void addTable(PyObject* module);
void addFollowing(PyObject* module);

} // namespace tav::python
