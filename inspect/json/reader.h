/// @file build_reader.h
/// Reads a JSON document from front to back and hands it to the encoder. Memory grows with the depth, and with the
/// longest single text.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "inspect/json/encoder.h"
#include "inspect/json/parser.h"
#include "tav/inspect/dictionary.hpp"
#include "tav/inspect/textSource.hpp"

namespace tav::inspect
{

/// The one element of a name; nothing when there is none. Throws BuildError when there are more.
std::optional<uint16_t> elementNamed(std::string_view name, const Dictionary& dictionary);

/// What is said of a name that no element has.
BuildError unknownElement(std::string_view name, const Dictionary& dictionary);

/// A single value of the document.
struct Scalar
{
  enum class Kind : uint8_t
  {
    null,
    truth,
    integer,
    fraction,
    text
  };
  Kind kind = Kind::null;
  std::string_view text{}; ///< of numbers: in decimal; of truth: 1 or 0
};

class DocumentReader final : private JsonHandler
{
public:
  /// `dictionary` outlives this object.
  DocumentReader(TextSource& text, StreamEncoder& encoder, const Dictionary& dictionary)
      : source_(text), encoder_(encoder), dictionary_(dictionary) {}

  /// Reads everything. Throws Error, with the place, when the text is no JSON or describes no stream.
  void read();

private:
  void null() override;
  void boolean(bool value) override;
  void integer(std::string_view digits) override;
  void fraction(std::string_view text) override;
  void string(std::string_view text) override;
  void startObject() override;
  void key(std::string_view name) override;
  void endObject() override;
  void startArray() override;
  void endArray() override;

  enum class Where : uint8_t
  {
    document, ///< the object around everything, with form and nodes
    form,
    nodes,     ///< an array of node objects
    node,      ///< a node object: keys are properties
    shortNode, ///< keys are elements, those with $ are properties
    shortList, ///< an object whose keys are elements, not itself a node
    repeated,  ///< an array of values of one element
    pieces,    ///< an array that is a value: texts or numbers
    bytes,     ///< an array of hexadecimal texts and counts of zeros
    date
  };
  struct Level
  {
    Where where;
    std::string key{};  ///< the key that is being read
    uint64_t index = 0; ///< in arrays: the item that is being read
    bool begun = false; ///< of node and shortNode: the group has begun
    uint16_t elm = 0;   ///< of repeated
    bool given = false; ///< of document: nodes were read
  };

  Level& top() { return levels_.back(); }
  void push(Where where);
  void scalar(const Scalar& value);
  void scalarIn(Level& level, const Scalar& value);
  void documentKey(std::string_view name);
  void documentValue(std::string_view name, const Scalar& value);
  void formValue(std::string_view name, const Scalar& value);
  void startForm();
  void beginNodes();
  void startChild(uint16_t elm);
  void startChild(std::string_view name);
  void elementProperty(Properties& properties, std::string_view name, const Scalar& value);
  void shortValue(const Scalar& value);
  void property(std::string_view name, const Scalar& value);
  bool headerProperty(Properties& properties, std::string_view name, const Scalar& value);
  void valueProperty(std::string_view name, const Scalar& value);
  void giveValue(const Scalar& value);
  void givePiece(const Scalar& value);
  void giveBytes(const Scalar& value);
  void setGiven(Given given);
  void dateField(std::string_view name, const Scalar& value);
  void startObjectProperty(std::string_view name);
  void startArrayProperty(std::string_view name);
  void beginGroup(Level& level);
  void endNode(Level& level);
  void endLine();
  void closeTo(uint64_t depth);
  void spill();
  void close();
  std::string pointer() const;
  [[noreturn]] void fail(const std::string& sentence) const;

  TextSource& source_;
  StreamEncoder& encoder_;
  const Dictionary& dictionary_;
  std::vector<Level> levels_{};
  Draft draft_{};
  Form form_{};
  bool formSet_ = false;
  bool formGiven_ = false; ///< the document has a form of its own
  bool lines_ = false;
  bool started_ = false;
  TAVTimeStamp date_{};
};

} // namespace tav::inspect
