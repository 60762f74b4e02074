/// The C interface: opening arbitrary bytes, walking them, asking every node for everything, searching, and nodes that
/// a caller has tampered with.
#include <algorithm>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include "fuzz/input.h"
#include "tav/tav_c.h"

namespace
{

using fuzz::demand;

/// Failures are codes of the library.
uint32_t accept(uint32_t rc)
{
  demand(std::strcmp(tav_message(rc), "unknown code") != 0, "a code that is none");
  return rc;
}

class Looker
{
public:
  Looker(tav_reader* reader, uint64_t size)
      : reader_(reader), most_(size / 8 + 1) {}

  void everything(const std::string& path)
  {
    tav_node root{};
    uint64_t roots = 0;
    for (uint32_t rc = accept(tav_next_root(reader_, nullptr, &root)); rc == TAV_RC_OK;
         rc = accept(tav_next_root(reader_, &root, &root)))
    {
      demand(++roots <= most_, "roots that do not end");
      walk(root, 0);
      search(&root, path);
    }
    search(nullptr, path);
    search(nullptr, "**/*");
    search(nullptr, "/*/*[2]");
  }

  /// A node as nobody handed it out: there is nothing to be right about it but that it does no harm.
  void tampered(fuzz::Input& input)
  {
    tav_node node{};
    if (accept(tav_next_root(reader_, nullptr, &node)) != TAV_RC_OK)
    {
      return;
    }
    const uint64_t owner = node.reserved[3];
    auto* const bytes = reinterpret_cast<uint8_t*>(&node);
    for (int i = 0; i < 8; ++i) bytes[input.byte() % sizeof node] = input.byte();
    node.reserved[3] = owner ^ (input.byte() & 0xFU);
    look(node);
    tav_node out{};
    accept(tav_first_child(reader_, &node, &out));
    accept(tav_next_sibling(reader_, &node, &out));
    accept(tav_next_root(reader_, &node, &out));
    search(&node, "*");
  }

private:
  void walk(const tav_node& group, unsigned depth)
  {
    look(group);
    if (depth == 100)
    {
      return;
    }
    tav_node child{};
    for (uint32_t rc = accept(tav_first_child(reader_, &group, &child)); rc == TAV_RC_OK;
         rc = accept(tav_next_sibling(reader_, &child, &child)))
    {
      if (++steps_ > 20 * most_)
      {
        return; // levels of groups can overlap
      }
      walk(child, depth + 1);
    }
    static_cast<void>(std::strlen(tav_last_message(reader_)));
  }

  void look(const tav_node& node)
  {
    uint64_t number = 0;
    uint64_t low = 0;
    int64_t whole = 0;
    const char* text = nullptr;
    const void* data = nullptr;
    size_t size = 0;
    accept(tav_get_u64(reader_, &node, &number));
    accept(tav_get_i64(reader_, &node, &whole));
    accept(tav_get_u128(reader_, &node, &number, &low));
    accept(tav_get_time(reader_, &node, &whole));
    if (accept(tav_get_text(reader_, &node, &text, &size)) == TAV_RC_OK)
    {
      touch(text, size);
    }
    if (accept(tav_get_bytes(reader_, &node, &data, &size)) == TAV_RC_OK)
    {
      touch(data, size);
    }
    uint8_t part[16];
    size = sizeof part;
    if (accept(tav_read(reader_, &node, number, part, &size)) == TAV_RC_OK)
    {
      touch(part, size);
    }
    static_cast<void>(tav_tag(node.elm));
  }

  void touch(const void* bytes, size_t size)
  {
    const auto* const first = static_cast<const uint8_t*>(bytes);
    for (size_t i = 0; i < size; ++i) sum_ = sum_ + first[i];
  }

  void search(const tav_node* from, const std::string& path)
  {
    tav_node first{};
    const uint32_t one = accept(tav_find(reader_, from, path.c_str(), &first));
    count_ = 0;
    const auto visit = [](const tav_node* node, void* context) {
      auto& self = *static_cast<Looker*>(context);
      self.look(*node);
      return ++self.count_ > self.most_ ? 1 : 0;
    };
    const uint32_t all = accept(tav_find_each(reader_, from, path.c_str(), visit, this));
    demand(count_ <= most_, "more matches than nodes");
    demand(one != TAV_RC_OK || count_ != 0, "one path, two answers");
    demand(one != TAV_RC_NOT_FOUND || all == TAV_RC_NOT_FOUND, "one path, two answers");
  }

  tav_reader* reader_;
  uint64_t most_;
  uint64_t steps_ = 0;
  uint64_t count_ = 0;
  volatile uint64_t sum_ = 0;
};

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
  if (size > fuzz::kLargest)
  {
    return 0;
  }
  fuzz::Input input(data, size);
  const uint8_t choice = input.byte();
  const std::string path = input.text(24);
  fuzz::Input later = input;
  const auto stream = input.rest();
  // Ends with its block, so that a step behind it is seen.
  const auto exact = std::make_unique<uint8_t[]>(stream.size());
  std::copy(stream.begin(), stream.end(), exact.get());
  const tav_form form{static_cast<uint8_t>(choice % 3), static_cast<uint8_t>((choice / 3) % 3 * 32),
                      static_cast<uint8_t>((choice / 9) % 3)};
  tav_reader* reader = nullptr;
  if (accept(tav_open_memory(exact.get(), stream.size(), &form, &reader)) == TAV_RC_OK)
  {
    Looker looker(reader, stream.size());
    looker.everything(path);
    looker.tampered(later);
  }
  tav_close(reader);
  return 0;
}
