// The writing half of tav_c.h, over the C++ layer's writer.
#include <chrono>
#include <cstdlib>
#include <cstring>
#include <deque>
#include <memory>
#include <string_view>

#include "inspect/c/reader.h"

using namespace tav;
using namespace tav::inspect;

/// A writer of the C interface.
struct tav_writer
{
  ~tav_writer()
  {
    writer.reset(); // groups that are still open are not closed any more
  }

  std::unique_ptr<Writer> writer{};
  std::deque<Group> groups{}; ///< open ones, the root first
  bool isFile = false;
  mutable Failed failure{};
};

namespace tav::inspect
{

namespace
{

StreamOptions optionsOf(const FormChoice& form)
{
  StreamOptions options;
  options.byteOrder = form.swapped.value_or(false) ? ByteOrder::swapped : ByteOrder::native;
  options.root = form.root64.value_or(true) ? Width::bits64 : Width::bits32;
  options.align8 = form.aligned.value_or(false);
  return options;
}

bool isGiven(const tav_form* form)
{
  return form != nullptr && (form->byte_order != 0 || form->root_bits != 0 || form->aligned != 0);
}

/// Makes a writer with what `open` puts into it.
template<class Open>
uint32_t make(const tav_form* form, tav_writer** out, Open&& open)
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
    auto made = std::make_unique<tav_writer>();
    const uint32_t rc = open(optionsOf(*choice), *made);
    if (rc == TAV_RC_OK)
    {
      *out = made.release();
    }
    return rc;
  });
}

/// Calls `work(writer)`, whose exceptions are failures of the writer.
template<class Work>
uint32_t with(tav_writer* writer, Work&& work)
{
  return writer == nullptr ? uint32_t{TAV_RC_BAD_PARAM} : guarded(&writer->failure, [&] { return work(*writer); });
}

/// Calls `work(group)` with the innermost group.
template<class Work>
uint32_t withGroup(tav_writer* writer, Work&& work)
{
  return with(writer, [&](tav_writer& open) {
    if (open.groups.empty())
    {
      return failed(open.failure, TAV_RC_NOT_FOUND, "no group is open");
    }
    work(open.groups.back());
    return uint32_t{TAV_RC_OK};
  });
}

template<class Value>
uint32_t add(tav_writer* writer, uint16_t elm, const Value& value)
{
  return withGroup(writer, [&](Group& group) { group.add(elm, value); });
}

/// Text and bytes, of which null is refused also where there are none.
template<class Value>
uint32_t addFrom(tav_writer* writer, uint16_t elm, const void* from, const Value& value)
{
  return from != nullptr ? add(writer, elm, value) : with(writer, [](tav_writer& open) {
    return failed(open.failure, TAV_RC_BAD_PARAM, "an argument is null");
  });
}

/// A copy of a stream that outlives its writer.
void* copyOf(std::span<const std::byte> bytes)
{
  void* const copy = std::malloc(bytes.empty() ? 1 : bytes.size());
  if (copy == nullptr)
  {
    throw std::bad_alloc();
  }
  if (!bytes.empty())
  {
    std::memcpy(copy, bytes.data(), bytes.size());
  }
  return copy;
}

} // namespace

} // namespace tav::inspect

uint32_t tav_create_file(const char* path, const tav_form* form, uint32_t flags, tav_writer** out)
{
  return make(form, out, [=](const StreamOptions& options, tav_writer& made) {
    if (path == nullptr)
    {
      return uint32_t{TAV_RC_BAD_PARAM};
    }
    if (flags != 0 && flags != TAV_CREATE_APPEND && flags != TAV_CREATE_OVERWRITE)
    {
      return uint32_t{TAV_RC_BAD_OPTIONS};
    }
    const FileOptions file{.overwrite = flags == TAV_CREATE_OVERWRITE, .append = flags == TAV_CREATE_APPEND};
    made.isFile = true;
    // Without options a file that is gone on with has the form that it has.
    made.writer = file.append && !isGiven(form) ? std::make_unique<Writer>(path, file)
                                                : std::make_unique<Writer>(path, file, options);
    return uint32_t{TAV_RC_OK};
  });
}

uint32_t tav_create_memory(const tav_form* form, tav_writer** out)
{
  return make(form, out, [](const StreamOptions& options, tav_writer& made) {
    made.writer = std::make_unique<Writer>(options);
    return uint32_t{TAV_RC_OK};
  });
}

uint32_t tav_begin(tav_writer* writer, uint16_t elm, uint32_t info)
{
  return with(writer, [=](tav_writer& open) {
    const GroupOptions options{.info = info};
    open.groups.push_back(open.groups.empty() ? open.writer->group(elm, options)
                                              : open.groups.back().group(elm, options));
    return uint32_t{TAV_RC_OK};
  });
}

uint32_t tav_end(tav_writer* writer)
{
  const uint32_t rc = withGroup(writer, [](Group& group) { group.close(); });
  if (rc == TAV_RC_OK)
  {
    writer->groups.pop_back();
  }
  return rc;
}

uint32_t tav_abandon(tav_writer* writer)
{
  const uint32_t rc = withGroup(writer, [](Group& group) { group.abandon(); });
  if (rc == TAV_RC_OK)
  {
    writer->groups.pop_back();
  }
  return rc;
}

uint32_t tav_add_u32(tav_writer* writer, uint16_t elm, uint32_t value)
{
  return add(writer, elm, value);
}

uint32_t tav_add_u64(tav_writer* writer, uint16_t elm, uint64_t value)
{
  return add(writer, elm, value);
}

uint32_t tav_add_i32(tav_writer* writer, uint16_t elm, int32_t value)
{
  return add(writer, elm, value);
}

uint32_t tav_add_i64(tav_writer* writer, uint16_t elm, int64_t value)
{
  return add(writer, elm, value);
}

uint32_t tav_add_u128(tav_writer* writer, uint16_t elm, uint64_t high, uint64_t low)
{
  return add(writer, elm, Uint128{high, low});
}

uint32_t tav_add_text(tav_writer* writer, uint16_t elm, const char* text, size_t size)
{
  return addFrom(writer, elm, text, std::string_view(text, text != nullptr ? size : 0));
}

uint32_t tav_add_bytes(tav_writer* writer, uint16_t elm, const void* bytes, size_t size)
{
  return addFrom(writer, elm, bytes, std::span(static_cast<const std::byte*>(bytes), bytes != nullptr ? size : 0));
}

uint32_t tav_add_time(tav_writer* writer, uint16_t elm, int64_t nanoseconds)
{
  if (nanoseconds < 0)
  {
    return with(writer, [](tav_writer& open) {
      return failed(open.failure, TAV_RC_OUTSIDE_PARENT, "a moment before 1970 cannot be stored");
    });
  }
  using Nanoseconds = std::chrono::duration<int64_t, std::nano>;
  return add(writer, elm, std::chrono::sys_time<Nanoseconds>(Nanoseconds(nanoseconds)));
}

uint32_t tav_flush(tav_writer* writer)
{
  return with(writer, [](tav_writer& open) {
    if (open.isFile)
    {
      open.writer->flush();
    }
    return uint32_t{TAV_RC_OK};
  });
}

uint32_t tav_sync(tav_writer* writer)
{
  return with(writer, [](tav_writer& open) {
    if (open.isFile)
    {
      open.writer->sync();
    }
    return uint32_t{TAV_RC_OK};
  });
}

const char* tav_writer_message(const tav_writer* writer)
{
  if (writer == nullptr || !writer->failure.isThere)
  {
    return "";
  }
  Failed& failure = writer->failure;
  const uint32_t rc = guarded(nullptr, [&] {
    failure.text = problemLine(failure.problem);
    return uint32_t{TAV_RC_OK};
  });
  return rc == TAV_RC_OK ? failure.text.c_str() : tav_message(rc);
}

uint32_t tav_finish(tav_writer** writer, const void** bytes, size_t* size)
{
  if (writer == nullptr || *writer == nullptr)
  {
    return TAV_RC_BAD_PARAM;
  }
  const uint32_t rc = with(*writer, [=](tav_writer& open) {
    if (!open.isFile && (bytes == nullptr || size == nullptr))
    {
      return failed(open.failure, TAV_RC_BAD_PARAM, "an argument is null");
    }
    open.writer->finish();
    const void* const made = open.isFile ? nullptr : copyOf(open.writer->bytes());
    if (bytes != nullptr)
    {
      *bytes = made;
    }
    if (size != nullptr)
    {
      *size = open.isFile ? 0 : open.writer->bytes().size();
    }
    return uint32_t{TAV_RC_OK};
  });
  if (rc == TAV_RC_OK)
  {
    delete std::exchange(*writer, nullptr);
  }
  return rc;
}

void tav_free(const void* bytes)
{
  std::free(const_cast<void*>(bytes));
}

void tav_discard(tav_writer** writer)
{
  if (writer != nullptr)
  {
    delete std::exchange(*writer, nullptr);
  }
}
