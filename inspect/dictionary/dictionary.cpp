#include "tav/inspect/dictionary.hpp"

#include <algorithm>
#include <array>
#include <cstddef>
#include <filesystem>
#include <system_error>
#include <vector>

#include "inspect/dictionary/builtIn.h"
#include "inspect/dictionary/reader.h"
#include "inspect/walk/order.h"
#include "tav/inspect/phrases.hpp"
#include "tav/inspect/problem.hpp"
#include "tav/inspect/source.hpp"
#include "tav/inspect/value.hpp"

namespace tav::inspect
{

namespace
{

/// More than 65,536 elements with a sentence each have.
constexpr size_t kMostText = size_t{16} * 1024 * 1024;

/// A file from front to back.
class SourceText final : public TextSource
{
public:
  explicit SourceText(const std::string& path)
      : TextSource(path), bytes_(ByteSource::open(path, 2 * ByteSource::kPage)) {}

protected:
  size_t fetch(std::span<char> to) override
  {
    const size_t count = bytes_->read(at_, std::span(reinterpret_cast<uint8_t*>(to.data()), to.size()));
    at_ += count;
    return count;
  }

private:
  std::unique_ptr<ByteSource> bytes_;
  uint64_t at_ = 0;
};

std::string wholeText(TextSource& source)
{
  std::string text;
  while (source.peek() != TextSource::kEnd)
  {
    const std::string_view piece = source.atHand();
    text += piece;
    source.skip(piece.size());
    if (text.size() > kMostText)
    {
      throw Error(Problem{.file = source.name(), .sentence = "no dictionary has more than " + byteText(kMostText)});
    }
  }
  return text;
}

bool isSame(const OwnElement& left, const OwnElement& right)
{
  return left.id == right.id && left.tag == right.tag && left.kind == right.kind && left.unit == right.unit &&
         left.text == right.text;
}

} // namespace

std::string_view kindText(ElementKind kind)
{
  static constexpr std::array<std::string_view, 4> texts = {"", "gauge", "counter", "text"};
  return texts[static_cast<size_t>(kind)];
}

struct Dictionary::State
{
  explicit State(std::vector<OwnElement> given)
      : elements(std::move(given))
  {
    putInOrder(elements, [](const auto& a, const auto& b) { return a.id < b.id; });
    for (const OwnElement& element : elements)
    {
      names.push_back({element.id, element.tag});
      byTag.push_back(&element);
    }
    putInOrder(byTag, [](const auto* a, const auto* b) { return a->tag < b->tag; });
  }
  State(const State&) = delete;
  State& operator=(const State&) = delete;

  static std::shared_ptr<const State> of(std::vector<OwnElement> given)
  {
    return given.empty() ? nullptr : std::make_shared<const State>(std::move(given));
  }

  std::vector<OwnElement> elements;
  std::vector<dictionary::OwnName> names{};
  std::vector<const OwnElement*> byTag{};
};

Dictionary Dictionary::read(TextSource& source)
{
  const std::string text = wholeText(source);
  return Dictionary(State::of(DictionaryReader(source.name(), text).read()));
}

Dictionary Dictionary::open(const std::string& path)
{
  SourceText text(path);
  return read(text);
}

Dictionary Dictionary::beside(const std::string& path)
{
  const auto slash = path.find_last_of(std::filesystem::path::preferred_separator == '\\' ? "/\\" : "/");
  const std::string folder = slash == std::string::npos ? "" : path.substr(0, slash + 1);
  for (const std::string& name : {path + ".names.json", folder + "tav-names.json"})
  {
    std::error_code error;
    if (std::filesystem::is_regular_file(std::filesystem::path(std::u8string(name.begin(), name.end())), error))
    {
      return open(name);
    }
  }
  return {};
}

Dictionary Dictionary::with(const Dictionary& other) const
{
  for (const OwnElement& element : other.elements())
  {
    const OwnElement* const sameId = find(element.id);
    const OwnElement* const clash = sameId != nullptr ? sameId : find(element.tag);
    if (clash != nullptr && !isSame(*clash, element))
    {
      const std::string what =
          sameId != nullptr ? "the id " + std::to_string(element.id) : "the tag " + inspect::quoted(element.tag);
      throw Error(Problem{.file = element.place, .sentence = what + " is given otherwise at " + clash->place});
    }
  }
  return over(other);
}

Dictionary Dictionary::over(const Dictionary& lower) const
{
  if (isEmpty() || lower.isEmpty() || state_ == lower.state_)
  {
    return isEmpty() ? lower : *this;
  }
  std::vector<OwnElement> both = state_->elements;
  for (const OwnElement& element : lower.elements())
  {
    if (find(element.id) == nullptr && find(element.tag) == nullptr)
    {
      both.push_back(element);
    }
  }
  return Dictionary(State::of(std::move(both)));
}

std::span<const OwnElement> Dictionary::elements() const noexcept
{
  return isEmpty() ? std::span<const OwnElement>() : state_->elements;
}

const OwnElement* Dictionary::find(uint16_t id) const noexcept
{
  const auto all = elements();
  const auto found = std::lower_bound(all.begin(), all.end(), id,
                                      [](const OwnElement& element, uint16_t wanted) { return element.id < wanted; });
  return found == all.end() || found->id != id ? nullptr : &*found;
}

const OwnElement* Dictionary::find(std::string_view tag) const noexcept
{
  if (isEmpty())
  {
    return nullptr;
  }
  const auto found =
      std::lower_bound(state_->byTag.begin(), state_->byTag.end(), tag,
                       [](const OwnElement* element, std::string_view wanted) { return element->tag < wanted; });
  return found == state_->byTag.end() || (*found)->tag != tag ? nullptr : *found;
}

std::string_view Dictionary::tagOf(uint16_t id) const noexcept
{
  const std::string_view builtIn = builtInTag(id);
  const OwnElement* const own = builtIn.empty() ? find(id) : nullptr;
  return own == nullptr ? builtIn : std::string_view(own->tag);
}

dictionary::OwnNames Dictionary::names() const noexcept
{
  return isEmpty() ? dictionary::OwnNames() : dictionary::OwnNames(state_->names);
}

} // namespace tav::inspect
