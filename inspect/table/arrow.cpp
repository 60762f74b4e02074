#include "tav/inspect/arrow.hpp"

#include <algorithm>
#include <cerrno>
#include <exception>
#include <memory>
#include <new>
#include <optional>
#include <string>
#include <utility>

#include "inspect/table/arrowColumn.h"

namespace tav::inspect
{

namespace
{

/// What a structure of the interface points to. `Struct` is ArrowSchema or ArrowArray.
template<class Struct>
struct Below
{
  Below(size_t count, bool hasDictionary)
      : children(count), pointers(count)
  {
    for (size_t i = 0; i < count; ++i)
    {
      pointers[i] = &children[i];
    }
    if (hasDictionary)
    {
      dictionary.emplace();
    }
  }

  void attach(Struct& to)
  {
    to.n_children = static_cast<int64_t>(children.size());
    to.children = children.empty() ? nullptr : pointers.data();
    to.dictionary = dictionary ? &*dictionary : nullptr;
  }

  std::vector<Struct> children;
  std::vector<Struct*> pointers;
  std::optional<Struct> dictionary{};
};

struct SchemaParts
{
  Below<ArrowSchema> below;
  std::string name;
  std::string format;
};

struct ArrayParts
{
  Below<ArrowArray> below;
  std::vector<std::vector<uint8_t>> bytes;
  std::vector<const void*> buffers{};
};

/// What has been moved elsewhere has no release any more.
template<class Struct>
void releaseOne(Struct& one)
{
  if (one.release != nullptr)
  {
    one.release(&one);
  }
}

template<class Struct, class Parts>
void releaseAll(Struct* top)
{
  for (int64_t i = 0; i < top->n_children; ++i)
  {
    releaseOne(*top->children[i]);
  }
  if (top->dictionary != nullptr)
  {
    releaseOne(*top->dictionary);
  }
  delete static_cast<Parts*>(top->private_data);
  *top = {};
}

extern "C" {
void tavReleaseSchema(ArrowSchema* schema)
{
  releaseAll<ArrowSchema, SchemaParts>(schema);
}
void tavReleaseArray(ArrowArray* array)
{
  releaseAll<ArrowArray, ArrayParts>(array);
}
}

/// A structure that is released unless it is kept.
template<class Struct>
class Making
{
public:
  Making() = default;
  Making(const Making&) = delete;
  Making& operator=(const Making&) = delete;
  ~Making() { releaseOne(made_); }

  Struct& operator*() { return made_; }
  void keep(Struct& to) { to = std::exchange(made_, {}); }

private:
  Struct made_{};
};

class Stream
{
public:
  Stream(const Table& table, const ArrowOptions& options)
      : table_(table), batchRows_(std::max<uint64_t>(options.batchRows, 1))
  {
    std::vector<size_t> columns = options.columns;
    for (size_t i = 0; options.columns.empty() && i < table.columns().size(); ++i)
    {
      columns.push_back(i);
    }
    for (const size_t column : columns)
    {
      columns_.emplace_back(table_, column, options.dictionaries);
    }
  }

  void schema(ArrowSchema& out) const
  {
    Making<ArrowSchema> made;
    makeSchema(*made, "", "+s", columns_.size(), false);
    for (size_t i = 0; i < columns_.size(); ++i)
    {
      columns_[i].schema(*(*made).children[i]);
    }
    made.keep(out);
  }

  /// The next batch; one without `release` behind the last.
  void next(ArrowArray& out)
  {
    const std::vector<RowRun> rows = nextRows();
    if (rows.empty())
    {
      out = {};
      return;
    }
    Making<ArrowArray> made;
    uint64_t length = 0;
    for (const RowRun& run : rows)
    {
      length += run.count;
    }
    makeArray(*made, length, 0, std::vector<std::vector<uint8_t>>(1), columns_.size(), false);
    for (size_t i = 0; i < columns_.size(); ++i)
    {
      columns_[i].array(rows, *(*made).children[i]);
    }
    made.keep(out);
  }

  std::string error{};

private:
  std::vector<RowRun> nextRows()
  {
    std::vector<RowRun> rows;
    uint64_t wanted = batchRows_;
    while (wanted != 0 && chunk_ < table_.chunks().size())
    {
      const TableChunk& chunk = *table_.chunks()[chunk_];
      const auto count = static_cast<size_t>(std::min<uint64_t>(wanted, chunk.rows() - row_));
      if (count != 0)
      {
        rows.push_back({&chunk, row_, count});
      }
      wanted -= count;
      row_ += count;
      if (row_ == chunk.rows())
      {
        ++chunk_;
        row_ = 0;
      }
    }
    return rows;
  }

  Table table_;
  uint64_t batchRows_;
  std::vector<ArrowColumn> columns_{};
  size_t chunk_ = 0;
  size_t row_ = 0;
};

/// Does a step of the stream; an error number when it throws.
template<class Step>
int guarded(ArrowArrayStream* stream, const Step& step)
{
  Stream& of = *static_cast<Stream*>(stream->private_data);
  try
  {
    of.error.clear();
    step(of);
    return 0;
  }
  catch (const std::bad_alloc&)
  {
    return ENOMEM;
  }
  catch (const std::exception& failure)
  {
    of.error = failure.what();
    return EIO;
  }
}

extern "C" {
int tavStreamSchema(ArrowArrayStream* stream, ArrowSchema* out)
{
  return guarded(stream, [out](const Stream& of) { of.schema(*out); });
}
int tavStreamNext(ArrowArrayStream* stream, ArrowArray* out)
{
  return guarded(stream, [out](Stream& of) { of.next(*out); });
}
const char* tavStreamError(ArrowArrayStream* stream)
{
  const Stream& of = *static_cast<const Stream*>(stream->private_data);
  return of.error.empty() ? nullptr : of.error.c_str();
}
void tavReleaseStream(ArrowArrayStream* stream)
{
  delete static_cast<Stream*>(stream->private_data);
  *stream = {};
}
}

} // namespace

void makeSchema(ArrowSchema& out, std::string name, std::string format, size_t children, bool hasDictionary)
{
  auto parts = std::make_unique<SchemaParts>(
      SchemaParts{Below<ArrowSchema>(children, hasDictionary), std::move(name), std::move(format)});
  out = {};
  out.name = parts->name.c_str();
  out.format = parts->format.c_str();
  out.flags = ARROW_FLAG_NULLABLE;
  parts->below.attach(out);
  out.release = tavReleaseSchema;
  out.private_data = parts.release();
}

void makeArray(ArrowArray& out, uint64_t length, uint64_t missing, std::vector<std::vector<uint8_t>> buffers,
               size_t children, bool hasDictionary)
{
  auto parts =
      std::make_unique<ArrayParts>(ArrayParts{Below<ArrowArray>(children, hasDictionary), std::move(buffers)});
  for (std::vector<uint8_t>& buffer : parts->bytes)
  {
    const bool isBitmap = parts->buffers.empty();
    buffer.reserve(1); // only the bitmap may be none
    parts->buffers.push_back(isBitmap && buffer.empty() ? nullptr : buffer.data());
  }
  out = {};
  out.length = static_cast<int64_t>(length);
  out.null_count = static_cast<int64_t>(missing);
  out.n_buffers = static_cast<int64_t>(parts->buffers.size());
  out.buffers = parts->buffers.data();
  parts->below.attach(out);
  out.release = tavReleaseArray;
  out.private_data = parts.release();
}

void toArrow(const Table& table, ArrowArrayStream* out, const ArrowOptions& options)
{
  auto stream = std::make_unique<Stream>(table, options);
  *out = {};
  out->get_schema = tavStreamSchema;
  out->get_next = tavStreamNext;
  out->get_last_error = tavStreamError;
  out->release = tavReleaseStream;
  out->private_data = stream.release();
}

} // namespace tav::inspect
