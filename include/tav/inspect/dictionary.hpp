/// @file dictionary.hpp
/// Names, kinds, units and meanings of elements that the built-in dictionary does not have, from files that their
/// owners write. docs/tav.md describes the form.
#pragma once

#include <algorithm>
#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <string_view>
#include <utility>

#include "tav/dictionary.hpp"
#include "tav/inspect/api.hpp"
#include "tav/inspect/textSource.hpp"

namespace tav::inspect
{

/// What the values of an element are, for whoever draws or sums them up.
enum class ElementKind : uint8_t
{
  unknown,
  gauge,   ///< goes up and down
  counter, ///< only grows, until it begins anew
  text
};

/// "gauge", "counter", "text"; empty for an unknown one.
TAV_INSPECT_API std::string_view kindText(ElementKind kind);

/// An element of a dictionary file.
struct OwnElement
{
  uint16_t id = 0;
  std::string tag{};
  ElementKind kind = ElementKind::unknown;
  std::string unit{};  ///< "1", "ms"; empty: not given
  std::string text{};  ///< what it means; empty: not given
  std::string place{}; ///< where it is given: "names.json: line 2, column 3"
};

/// What own elements are called, beside the built-in dictionary. A value, cheap to copy; any thread may use it. Its ids
/// and tags are none of the built-in ones, and no two of its elements share one.
class Dictionary
{
public:
  /// Of no own elements.
  Dictionary() noexcept = default;

  /// Reads a dictionary. Throws Error, with line and column, for a text that is none, and with both places where an id
  /// or a tag is given twice, or is that of a built-in element.
  TAV_INSPECT_API static Dictionary read(TextSource& text);

  /// The same from a regular file. Throws Error also where it cannot be read.
  TAV_INSPECT_API static Dictionary open(const std::string& path);

  /// What lies beside a file: `day.tav.names.json` beside `day.tav`, else `tav-names.json` in its folder, else an empty
  /// one. Throws Error as `open`.
  TAV_INSPECT_API static Dictionary beside(const std::string& path);

  /// Both. Throws Error, with both places, where they say different things of an id or of a tag.
  TAV_INSPECT_API Dictionary with(const Dictionary& other) const;

  /// Both; where they say different things of an id or of a tag, this one is right.
  TAV_INSPECT_API Dictionary over(const Dictionary& lower) const;

  /// Whether both have the same elements, wherever they are given.
  friend bool operator==(const Dictionary& a, const Dictionary& b) noexcept
  {
    const auto isSame = [](const OwnElement& x, const OwnElement& y) {
      return x.id == y.id && x.tag == y.tag && x.kind == y.kind && x.unit == y.unit && x.text == y.text;
    };
    return a.state_ == b.state_ || std::equal(a.elements().begin(), a.elements().end(), b.elements().begin(),
                                              b.elements().end(), isSame);
  }

  bool isEmpty() const noexcept { return state_ == nullptr; }

  /// All own elements, by id.
  TAV_INSPECT_API std::span<const OwnElement> elements() const noexcept;

  /// An own element; null when it has none of this id, or of this tag.
  TAV_INSPECT_API const OwnElement* find(uint16_t id) const noexcept;
  TAV_INSPECT_API const OwnElement* find(std::string_view tag) const noexcept;

  /// The tag of any element, built-in ones included; empty when there is none. Lives as long as a copy of this object.
  TAV_INSPECT_API std::string_view tagOf(uint16_t id) const noexcept;

  /// The own names, for tav::Path. They live as long as a copy of this object.
  TAV_INSPECT_API dictionary::OwnNames names() const noexcept;

private:
  struct State;
  explicit Dictionary(std::shared_ptr<const State> state) noexcept
      : state_(std::move(state)) {}

  std::shared_ptr<const State> state_{}; ///< null: no own elements
};

} // namespace tav::inspect
