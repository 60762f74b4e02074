/// @file build_reader.h
/// Reads a JSON document from front to back and hands it to the encoder. Memory grows with the depth, and with the
/// longest single text.
#pragma once

#include <cstdio>
#include <istream>
#include <optional>
#include <streambuf>
#include <string>
#include <string_view>
#include <vector>

#include <nlohmann/json.hpp>

#include "tools/build_encoder.h"

namespace tav::tool
{

/// The text of a document, which knows where it is being read.
class TextSource : public std::streambuf
{
public:
  /// "-" is standard input. Throws Failure when the file cannot be read.
  explicit TextSource(const std::string& path);
  ~TextSource() override;
  TextSource(const TextSource&) = delete;
  TextSource& operator=(const TextSource&) = delete;

  const std::string& name() const { return name_; }
  uint64_t position() const { return base_ + static_cast<uint64_t>(gptr() - eback()); }
  uint64_t line() const;
  /// Skips blanks; false at the end of the text.
  bool skipBlanks();

protected:
  int_type underflow() override;

private:
  std::string name_;
  std::FILE* file_;
  bool standard_;
  uint64_t base_ = 0;
  uint64_t lines_ = 0; ///< before the buffer
  std::vector<char> buffer_;
};

/// The one element of a name. Throws BuildError when there is none, or more than one.
uint16_t elementNamed(std::string_view name);

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
  std::string text{}; ///< of numbers: in decimal; of truth: 1 or 0
};

class DocumentReader final : public nlohmann::json_sax<nlohmann::json>
{
public:
  DocumentReader(TextSource& text, StreamEncoder& encoder)
      : source_(text), encoder_(encoder) {}

  /// Reads everything. Throws Failure, with the place, when the text is no JSON or describes no stream.
  void read();

  bool null() override;
  bool boolean(bool value) override;
  bool number_integer(int64_t value) override;
  bool number_unsigned(uint64_t value) override;
  bool number_float(double value, const std::string& text) override;
  bool string(std::string& value) override;
  bool binary(binary_t& value) override;
  bool start_object(size_t count) override;
  bool key(std::string& name) override;
  bool end_object() override;
  bool start_array(size_t count) override;
  bool end_array() override;
  bool parse_error(size_t position, const std::string& token, const nlohmann::detail::exception& error) override;

private:
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
  void documentKey(const std::string& name);
  void documentValue(const std::string& name, const Scalar& value);
  void formValue(const std::string& name, const Scalar& value);
  void startForm();
  void beginNodes();
  void startChild(uint16_t elm);
  void shortValue(const Scalar& value);
  void property(const std::string& name, const Scalar& value);
  bool headerProperty(Properties& properties, const std::string& name, const Scalar& value);
  void valueProperty(const std::string& name, const Scalar& value);
  void giveValue(const Scalar& value);
  void givePiece(const Scalar& value);
  void giveBytes(const Scalar& value);
  void setGiven(Given given);
  void dateField(const std::string& name, const Scalar& value);
  void startObjectProperty(const std::string& name);
  void startArrayProperty(const std::string& name);
  void beginGroup(Level& level);
  void endNode(const Level& level);
  void endLine();
  void closeTo(uint64_t depth);
  void spill();
  void close();
  std::string pointer() const;
  [[noreturn]] void fail(const std::string& sentence) const;

  TextSource& source_;
  StreamEncoder& encoder_;
  std::vector<Level> levels_{};
  Draft draft_{};
  Form form_{};
  bool formSet_ = false;
  bool formGiven_ = false; ///< the document has a form of its own
  bool lines_ = false;
  bool started_ = false;
  TAVTimeStamp date_{};
};

} // namespace tav::tool
