/// Streams under test: written into memory or through a ring, read back from either, damaged in between.
#pragma once

#include <cstdint>
#include <memory>
#include <ostream>
#include <stdexcept>
#include <string>

#include "support/elements.h"
#include "support/vectorStorage.h"
#include "tav/tav.h"

namespace test
{

/// How a stream is kept and written.
struct Form
{
  bool buffered = false; ///< through a circular buffer instead of direct memory
  bool swap = false;     ///< in the other byte order
  bool align = false;    ///< payloads padded to multiples of 8
  bool root32 = false;   ///< the first node has a 32-bit header
  uint64_t pageBytes = 64;
  uint64_t ringBytes = 10 * 64;
  uint64_t longestTransfer = ~uint64_t{0}; ///< what a read of the storage under a ring gives at the most
};

inline std::ostream& operator<<(std::ostream& out, const Form& form)
{
  return out << (form.buffered ? "buffered" : "direct") << (form.swap ? "Swapped" : "") << (form.align ? "Aligned" : "")
             << (form.root32 ? "Root32" : "");
}

/// The form with the low byte first on every machine, as streams are written down in tests.
inline Form lowFirst(Form form = {})
{
  form.swap = kBigEndianHost;
  return form;
}

/// A ring of one page of 16 bytes: a header fills it, and what is behind needs another read.
inline Form onePage()
{
  return {.buffered = true, .pageBytes = 16, .ringBytes = 16};
}

/// Names for TEST_P instances over forms.
inline std::string formName(const Form& form)
{
  std::string name = form.buffered ? "Buffered" : "Direct";
  name += form.swap ? "Swapped" : "Native";
  name += form.align ? "Aligned" : "Packed";
  return name + (form.root32 ? "Root32" : "");
}

inline constexpr auto kFormName = [](const auto& instance) { return formName(instance.param); };

inline void check(uint32_t rc, const char* what)
{
  if (rc != TAV_RC_OK)
  {
    throw std::runtime_error(std::string(what) + ": " + korCodeName(rc));
  }
}

/// A handle of any mode over a storage of its own choosing, closed at the end.
class Handle
{
public:
  Handle(TAVSideStorage& storage, uint64_t options, const Form& form)
  {
    const uint64_t all = options | (form.root32 ? TAV_OPT_ROOT32 : 0);
    TAVInitParam param(&storage, all, form.ringBytes, 0x20000, form.swap ? TAV_BYTE_ORDER_SWAPPED : uint8_t{0},
                       form.align ? uint8_t{1} : uint8_t{0});
    check(tavInitHandle(&handle_, &param), "tavInitHandle");
  }
  ~Handle()
  {
    if (handle_ != nullptr)
    {
      tavTermHandle(&handle_);
    }
  }
  Handle(const Handle&) = delete;
  Handle& operator=(const Handle&) = delete;

  TAVHandle* get()
  {
    return handle_;
  }
  TAVHandle* operator->()
  {
    return handle_;
  }
  void close()
  {
    check(tavTermHandle(&handle_), "tavTermHandle");
  }

private:
  TAVHandle* handle_ = nullptr;
};

/// A handle with its storage.
class Stream
{
public:
  TAVHandle* handle()
  {
    return handle_->get();
  }
  TAVSideStorage& storage()
  {
    return *storage_;
  }
  VectorStorage& vectorStorage()
  {
    return dynamic_cast<VectorStorage&>(*storage_);
  }

protected:
  explicit Stream(uint64_t blockBytes)
      : size_(blockBytes), block_(new uint8_t[size_ != 0 ? size_ : 1]())
  {
  }

  // In this order: the handle ends before what it is over.
  uint64_t size_;
  std::unique_ptr<uint8_t[]> block_;
  std::unique_ptr<TAVSideStorage> storage_;
  std::unique_ptr<Handle> handle_;
};

/// A stream being written. Throws when a call fails that the test is not about.
class StreamWriter : public Stream
{
public:
  explicit StreamWriter(const Form& form = {}, uint64_t blockBytes = 0x10000, uint64_t mode = TAV_OPT_WRITE)
      : Stream(form.buffered ? 0 : blockBytes), form_(form)
  {
    if (form.buffered)
    {
      storage_ = std::make_unique<VectorStorage>(form.pageBytes);
    }
    else
    {
      storage_ = std::make_unique<TAVSSMemory>(block_.get(), size_);
    }
    handle_ = std::make_unique<Handle>(*storage_, mode, form);
  }

  [[nodiscard]] const Form& form() const
  {
    return form_;
  }

  /// Appends a data element or opens a group; returns its header with the offset.
  TAVHeader add(Element node)
  {
    TAVHeaderData data = node.data();
    check(tavAddElement(0, handle(), &data), "tavAddElement");
    return data.header;
  }
  /// A string of tavAddString with two bytes to spare behind the text.
  void addString(Element node, uint16_t codePage)
  {
    node.payload.resize(node.payload.size() + 2);
    TAVHeaderData data = node.data();
    check(tavAddString(0, handle(), &data, codePage), "tavAddString");
  }
  void close()
  {
    check(tavCloseHeader(0, handle()), "tavCloseHeader");
  }
  void abandon()
  {
    check(tavCloseHeader(1, handle()), "tavCloseHeader");
  }
  [[nodiscard]] uint64_t length() const
  {
    return (*handle_)->streamBytes;
  }

  /// The stream's bytes so far. Over a ring, pending pages are written first. Of padding that would reach past the
  /// block's end, which the writer counts all the same, there is none.
  Bytes bytes()
  {
    const uint64_t count = form_.buffered ? length() : std::min<uint64_t>(length(), size_);
    if (!form_.buffered)
    {
      return {block_.get(), block_.get() + count};
    }
    check((*handle_)->pCircularBuf->reset(), "reset");
    const Bytes& all = vectorStorage().bytes;
    return {all.begin(), all.begin() + static_cast<ptrdiff_t>(std::min<uint64_t>(count, all.size()))};
  }

private:
  Form form_;
};

/// A handle for reading over bytes of a stream. Over memory the bytes lie in a heap block of exactly their size, so
/// that a step outside is seen by the address sanitizer. `slack` adds zero bytes behind the stream: readers of direct
/// memory do not see an eye/size pair that ends at the block's very end.
class StreamReader : public Stream
{
public:
  explicit StreamReader(const Bytes& bytes, const Form& form = {}, uint64_t slack = 0)
      : Stream(bytes.size() + slack)
  {
    std::copy(bytes.begin(), bytes.end(), block_.get());
    if (form.buffered)
    {
      storage_ = std::make_unique<VectorStorage>(form.pageBytes, Bytes(block_.get(), block_.get() + size_),
                                                 VectorStorage::kReadOnly);
      vectorStorage().longestTransfer = form.longestTransfer;
    }
    else
    {
      storage_ = std::make_unique<TAVSSMemory>(block_.get(), size_);
    }
    handle_ = std::make_unique<Handle>(*storage_, TAV_OPT_READ, form);
  }
};

} // namespace test
