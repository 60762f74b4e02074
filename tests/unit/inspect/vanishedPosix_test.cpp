/// Documents whose file is removed, renamed or replaced while they are open.
#include <filesystem>
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "cpp/layer.h"
#include "tav/inspect/document.hpp"
#include "tav/tav_c.h"

using namespace test;
using testing::ElementsAre;

namespace
{

constexpr uint32_t kRoots = 3;

void write(const std::filesystem::path& path, uint32_t first)
{
  tav::Writer writer(path);
  for (uint32_t i = 0; i < kRoots; ++i)
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    root.add(TAV_ELM_CMN_CPU_ONLINE, first + i);
    root.close();
  }
  writer.finish();
}

/// By the C interface; closes the reader.
std::vector<uint64_t> numbersIn(tav_reader* reader)
{
  std::vector<uint64_t> numbers;
  tav_node root{};
  for (uint32_t rc = tav_next_root(reader, nullptr, &root); rc == TAV_RC_OK; rc = tav_next_root(reader, &root, &root))
  {
    tav_node child{};
    uint64_t number = 0;
    EXPECT_EQ(tav_first_child(reader, &root, &child), TAV_RC_OK);
    EXPECT_EQ(tav_get_u64(reader, &child, &number), TAV_RC_OK);
    numbers.push_back(number);
  }
  tav_close(reader);
  return numbers;
}

std::vector<uint32_t> numbersIn(const tav::inspect::Document& document)
{
  std::vector<uint32_t> numbers;
  for (const tav::Node& root : document.roots())
  {
    tav::ChildRange children = root.children();
    numbers.push_back((*children.begin()).as<uint32_t>());
  }
  return numbers;
}

} // namespace

TEST(Vanished, ADocumentReadsTheFileThatItHas)
{
  for (const bool isReplaced : {false, true})
  {
    const TemporaryPath file;
    const TemporaryPath other;
    write(file.path, 1);
    const tav::inspect::Document document(file.path);
    tav_reader* reader = nullptr;
    ASSERT_EQ(tav_open_file(tav::FilePath(file.path).c_str(), nullptr, &reader), TAV_RC_OK);
    if (isReplaced)
    {
      write(other.path, 11);
      std::filesystem::rename(other.path, file.path);
    }
    else
    {
      std::filesystem::remove(file.path);
    }
    EXPECT_THAT(numbersIn(document), ElementsAre(1U, 2U, 3U));
    EXPECT_THAT(numbersIn(reader), ElementsAre(1U, 2U, 3U));
    if (isReplaced)
    {
      EXPECT_THAT(numbersIn(tav::inspect::Document(file.path)), ElementsAre(11U, 12U, 13U));
    }
    else
    {
      EXPECT_EQ(thrownBy([&] { const tav::inspect::Document again(file.path); }), KOR_RC_NO_SUCH_FILE);
    }
  }
}
