#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"

using namespace tav::inspect;
using test::Bytes;

namespace
{

Bytes oneStream(bool swap, bool align)
{
  tav::Writer writer({.byteOrder = swap ? tav::ByteOrder::swapped : tav::ByteOrder::native, .align8 = align});
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = true});
    tav::Group host = root.group(TAV_ELM_CMN_HOST, {.eyeSize = true});
    host.add(TAV_ELM_CMN_HOST_NAME, "ada", {.eyeSize = true});
    host.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{8});
  }
  writer.finish();
  const auto view = writer.bytes();
  const auto* const first = reinterpret_cast<const uint8_t*>(view.data());
  return {first, first + view.size()};
}

std::string differences(const Bytes& a, const Bytes& b, const tav::inspect::Form& form)
{
  ByteSource first("a", std::span<const uint8_t>(a));
  ByteSource second("b", std::span<const uint8_t>(b));
  std::string text;
  diff({first, form}, {second, form}, {}, [&](const Difference& difference) {
    text += difference.before->path + "  " + difference.sentence + "\n";
  });
  return text;
}

std::vector<Assignment> assign(const std::string& path, const std::string& value)
{
  return {{pathOf(path), value}};
}

/// A file with given bytes, gone with the object.
class OnDisk
{
public:
  explicit OnDisk(const Bytes& bytes)
  {
    KORHFile file;
    path_ = openTemporary(file, 1);
    file.close();
    std::ofstream(path_, std::ios::binary).write(reinterpret_cast<const char*>(bytes.data()), std::ssize(bytes));
  }
  ~OnDisk() { std::filesystem::remove(path_); }

  void open(KORHFile& file) const
  {
    KORFileOpenParam param;
    param.pPath = path_.c_str();
    param.options = KOR_FILE_UPDATE;
    ASSERT_EQ(file.open(&param), TAV_RC_OK);
  }

  const std::string& path() const { return path_; }

  Bytes bytes() const
  {
    std::ifstream file(path_, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
  }

private:
  std::string path_;
};

} // namespace

class EditInAForm : public testing::TestWithParam<std::tuple<bool, bool>>
{
protected:
  bool swap = std::get<0>(GetParam());
  bool align = std::get<1>(GetParam());
  tav::inspect::Form form{.swapped = swap, .root64 = true, .aligned = align};
  Bytes bytes = oneStream(swap, align);
  ByteSource source{"x", std::span<const uint8_t>(bytes)};
};

INSTANTIATE_TEST_SUITE_P(Forms, EditInAForm, testing::Combine(testing::Bool(), testing::Bool()));

TEST_P(EditInAForm, ALongerValueKeepsTheStreamSound)
{
  for (const size_t length : std::vector<size_t>{0, 1, 4, 8, 100, 300'000})
  {
    Editor editor(source, form, assign("/system/host/hostName", std::string(length, 'x')));
    EXPECT_EQ(editor.changed(), 1U);
    EXPECT_THROW(editor.requireSameSizes(), Error);
    test::Made made;
    editor.writeNew(made.file());
    EXPECT_EQ(test::defects(made.bytes(), form), 0U);
    EXPECT_THAT(differences(bytes, made.bytes(), form),
                testing::StartsWith("/system/host/hostName  ASCII String  \"ada\""));
    const Bytes longer = made.bytes();
    ByteSource again("y", std::span<const uint8_t>(longer));
    Editor back(again, form, assign("/system/host/hostName", "ada"));
    test::Made old;
    back.writeNew(old.file());
    EXPECT_EQ(old.bytes(), bytes);
  }
}

TEST_P(EditInAForm, AValueOfTheSameSizeIsWrittenIntoTheFile)
{
  const OnDisk disk(bytes);
  KORHFile file;
  disk.open(file);
  Editor editor(source, form, assign("**/cpuOnline", "4711"));
  editor.requireSameSizes();
  editor.writeInto(file);
  EXPECT_EQ(differences(bytes, disk.bytes(), form), "/system/host/cpuOnline  Uint32  8 -> 4711\n");
}

TEST_P(EditInAForm, AFileIsChangedWhereItIsOrAsAWholeNot)
{
  const OnDisk disk(bytes);
  Editor longer(source, form, assign("**/hostName", "grace"));
  EXPECT_THROW(longer.writeInPlace(disk.path()), Error);
  Editor editor(source, form, assign("**/cpuOnline", "4711"));
  EXPECT_THROW(editor.writeInPlace(disk.path() + ".nothing"), Error);
  EXPECT_FALSE(std::filesystem::exists(disk.path() + ".nothing"));
  EXPECT_EQ(disk.bytes(), bytes);
  editor.writeInPlace(disk.path());
  EXPECT_EQ(differences(bytes, disk.bytes(), form), "/system/host/cpuOnline  Uint32  8 -> 4711\n");
}

TEST_P(EditInAForm, NothingIsWrittenIntoAFileThatHasChanged)
{
  Bytes other = bytes;
  other[32] ^= 1; // the header of the host name
  const OnDisk disk(other);
  KORHFile file;
  disk.open(file);
  const std::vector<Assignment> assignments{{pathOf("**/cpuOnline"), "4711"}, {pathOf("**/hostName"), "eva"}};
  Editor editor(source, form, assignments);
  EXPECT_EQ(editor.changed(), 2U);
  EXPECT_THROW(editor.writeInto(file), Error);
  EXPECT_EQ(disk.bytes(), other);
}

TEST(Edit, CountsNodesThatHaveTheirValue)
{
  const Bytes bytes = oneStream(false, false);
  ByteSource source("x", std::span<const uint8_t>(bytes));
  const Editor editor(source, {}, assign("**/cpuOnline", "8"));
  EXPECT_EQ(editor.changed(), 0U);
  EXPECT_EQ(editor.unchanged(), 1U);
}

TEST(Edit, RefusesWhatHasNoValueOfItsOwn)
{
  const Bytes bytes = oneStream(false, false);
  ByteSource source("x", std::span<const uint8_t>(bytes));
  for (const char* const path : {"/system", "/system/endHdrEyeSize", "/system/cpu", "/nonsense"})
  {
    EXPECT_THROW(Editor(source, {}, assign(path, "8")), Error) << path;
  }
}
