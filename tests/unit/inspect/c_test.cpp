#include <cstring>
#include <string>
#include <utility>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/cHandles.h"
#include "support/layerOptions.h"

using namespace test;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::StartsWith;
using testing::StrEq;

namespace
{

/// Reads the numbers of valuesOf.
void readNumbers(const CReader& reader)
{
  uint64_t number = 0;
  int64_t whole = 0;
  uint64_t high = 0;
  uint64_t low = 0;
  tav_node node = found(reader, "/system/cpuOnline");
  EXPECT_EQ(tav_get_u64(reader.get(), &node, &number), TAV_RC_OK);
  EXPECT_EQ(number, 7U);
  EXPECT_EQ(tav_get_u128(reader.get(), &node, &high, &low), TAV_RC_OK);
  EXPECT_EQ(low, 7U);
  node = found(reader, "/system/#40001");
  EXPECT_EQ(tav_get_u64(reader.get(), &node, &number), TAV_RC_OK);
  EXPECT_EQ(number, UINT64_MAX);
  EXPECT_EQ(tav_get_i64(reader.get(), &node, &whole), TAV_RC_OUTSIDE_PARENT);
  EXPECT_THAT(tav_last_message(reader.get()), HasSubstr("/system/#40001"));
  node = found(reader, "/system/#40002");
  EXPECT_EQ(tav_get_i64(reader.get(), &node, &whole), TAV_RC_OK);
  EXPECT_EQ(whole, -7);
  EXPECT_EQ(tav_get_u64(reader.get(), &node, &number), TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(tav_get_u128(reader.get(), &node, &high, &low), TAV_RC_OUTSIDE_PARENT);
  node = found(reader, "/system/#40003");
  EXPECT_EQ(tav_get_i64(reader.get(), &node, &whole), TAV_RC_OK);
  EXPECT_EQ(whole, INT64_MIN);
  node = found(reader, "/system/#40004");
  EXPECT_EQ(tav_get_u128(reader.get(), &node, &high, &low), TAV_RC_OK);
  EXPECT_EQ(high, 1U);
  EXPECT_EQ(low, 2U);
  EXPECT_EQ(tav_get_u64(reader.get(), &node, &number), TAV_RC_OUTSIDE_PARENT);
}

/// Reads its texts.
void readTexts(const CReader& reader)
{
  uint64_t number = 0;
  const char* text = nullptr;
  size_t size = 0;
  tav_node node = found(reader, "/system/osName");
  EXPECT_EQ(tav_get_text(reader.get(), &node, &text, &size), TAV_RC_OK);
  EXPECT_EQ(std::string(text, size), "gr\xC3\xBC\xC3\x9F");
  EXPECT_EQ(tav_get_u64(reader.get(), &node, &number), TAV_RC_NOT_SUPPORTED);
  node = found(reader, "/system/hostName");
  EXPECT_EQ(tav_get_text(reader.get(), &node, &text, &size), TAV_RC_OK);
  EXPECT_EQ(std::string(text, size), "ada");
  EXPECT_EQ(node.payload_size, 3U);
  EXPECT_EQ(std::memcmp(node.payload, "ada", 3), 0);
}

/// Reads its bytes and its moment, and what a group has none of.
void readBytes(const CReader& reader)
{
  int64_t whole = 0;
  const char* text = nullptr;
  const void* data = nullptr;
  size_t size = 0;
  tav_node node = found(reader, "/system/#40005");
  EXPECT_EQ(tav_get_bytes(reader.get(), &node, &data, &size), TAV_RC_OK);
  ASSERT_EQ(size, 3U);
  EXPECT_EQ(std::memcmp(data, "\0\1\2", 3), 0);
  EXPECT_EQ(tav_get_text(reader.get(), &node, &text, &size), TAV_RC_NOT_SUPPORTED);
  char part[2] = {};
  size = sizeof part;
  EXPECT_EQ(tav_read(reader.get(), &node, 2, part, &size), TAV_RC_OK);
  EXPECT_EQ(size, 1U);
  EXPECT_EQ(part[0], 2);
  size = sizeof part;
  EXPECT_EQ(tav_read(reader.get(), &node, UINT64_MAX, part, &size), TAV_RC_OK);
  EXPECT_EQ(size, 0U);
  node = found(reader, "/system/#40006");
  EXPECT_EQ(tav_get_time(reader.get(), &node, &whole), TAV_RC_OK);
  EXPECT_EQ(whole, 1709202600123456000);
  node = found(reader, "/system/host");
  EXPECT_EQ(node.is_group, 1);
  EXPECT_EQ(node.payload, nullptr);
  EXPECT_EQ(tav_get_bytes(reader.get(), &node, &data, &size), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(tav_first_child(reader.get(), &node, &node), TAV_RC_NO_MORE_CHILDREN);
}

} // namespace

TEST(C, ReadsWhatItHasWritten)
{
  for (const uint8_t order : {uint8_t{1}, uint8_t{2}})
  {
    for (const uint8_t aligned : {uint8_t{1}, uint8_t{2}})
    {
      for (const uint8_t root : {uint8_t{32}, uint8_t{64}})
      {
        const tav_form form{order, root, aligned};
        const Bytes bytes = valuesOf(&form);
        const TemporaryPath file;
        writeFile(file.path, bytes);
        for (const bool isFile : {false, true})
        {
          const CReader reader = isFile ? openFile(file.path) : openMemory(bytes, &form);
          ASSERT_NE(reader, nullptr);
          tav_form told{};
          ASSERT_EQ(tav_form_of(reader.get(), &told), TAV_RC_OK);
          EXPECT_THAT((std::vector<int>{told.byte_order, told.root_bits, told.aligned}),
                      ElementsAre(order, root, aligned));
          readNumbers(reader);
          readTexts(reader);
          readBytes(reader);
        }
      }
    }
  }
}

namespace
{

/// All nodes by steps alone, in stream order.
void listNodes(tav_reader* reader, const tav_node& node, std::vector<tav_node>& all)
{
  all.push_back(node);
  tav_node child = node;
  uint32_t rc = tav_first_child(reader, &node, &child);
  for (; rc == TAV_RC_OK; rc = tav_next_sibling(reader, &child, &child))
  {
    listNodes(reader, child, all);
  }
  EXPECT_EQ(rc, TAV_RC_NO_MORE_CHILDREN) << tav_last_message(reader);
}

} // namespace

TEST(C, AgreesWithTheLayerOverRandomTrees)
{
  for (uint64_t seed = 0; seed < 100; ++seed)
  {
    SCOPED_TRACE(seed);
    const test::Tree tree = test::randomTree(seed, {.forget = seed % 2 == 0});
    const Bytes bytes = test::bytesOfTree(tree);
    const bool isLittle = tree.form.swap == test::kBigEndianHost;
    const tav_form form{isLittle ? uint8_t{1} : uint8_t{2}, tree.form.root32 ? uint8_t{32} : uint8_t{64},
                        tree.form.align ? uint8_t{2} : uint8_t{1}};
    const tav::Reader layer(test::spanOf(bytes), test::layerOptions(tree.form));
    std::vector<tav::Node> expected{layer.root()};
    for (const tav::Node& node : layer.root().descendants())
    {
      expected.push_back(node);
    }
    const test::TemporaryPath file;
    writeFile(file.path, bytes);
    for (const bool isFile : {false, true})
    {
      const CReader reader = isFile ? openFile(file.path, &form) : openMemory(bytes, &form);
      ASSERT_NE(reader, nullptr);
      tav_node root{};
      ASSERT_EQ(tav_next_root(reader.get(), nullptr, &root), TAV_RC_OK) << tav_last_message(reader.get());
      std::vector<tav_node> all;
      listNodes(reader.get(), root, all);
      ASSERT_EQ(all.size(), expected.size());
      for (size_t i = 0; i < all.size(); ++i)
      {
        const tav::Node& node = expected[i];
        EXPECT_EQ(all[i].offset, node.offset());
        EXPECT_EQ(all[i].size, node.size());
        EXPECT_EQ(all[i].info, node.info());
        EXPECT_EQ(all[i].type, node.type());
        EXPECT_EQ(all[i].elm, node.elm());
        EXPECT_EQ(all[i].header_bits, node.width() == tav::Width::bits64 ? 64 : 32);
        EXPECT_EQ(all[i].is_group, node.isGroup() ? 1 : 0);
        std::error_code ec;
        uint64_t number = 0;
        const auto value = node.asNumber<uint64_t>(ec);
        EXPECT_EQ(tav_get_u64(reader.get(), &all[i], &number), tav::codeOf(ec));
        EXPECT_EQ(number, ec ? 0 : value);
        const void* data = nullptr;
        size_t size = 0;
        if (!node.isGroup())
        {
          ASSERT_EQ(tav_get_bytes(reader.get(), &all[i], &data, &size), TAV_RC_OK);
          const auto* const first = static_cast<const uint8_t*>(data);
          EXPECT_EQ(Bytes(first, first + size), test::bytesOf(node.payload()));
        }
      }
      tav_node copy = root;
      EXPECT_EQ(tav_next_root(reader.get(), &copy, &copy), TAV_RC_NO_MORE_CHILDREN);
      EXPECT_EQ(copy.offset, root.offset) << "a failure leaves it as it was";
    }
  }
}

TEST(C, GoesFromRootToRoot)
{
  const Bytes first = valuesOf();
  const tav_form other{test::kBigEndianHost ? uint8_t{1} : uint8_t{2}, 32, 2};
  Bytes bytes = first;
  bytes.resize(bytes.size() + 100);
  const Bytes second = valuesOf(&other);
  bytes.insert(bytes.end(), second.begin(), second.end());
  const CReader reader = openMemory(bytes, nullptr);
  ASSERT_NE(reader, nullptr);
  tav_node root{};
  ASSERT_EQ(tav_next_root(reader.get(), nullptr, &root), TAV_RC_OK);
  EXPECT_EQ(root.offset, 0U);
  EXPECT_EQ(tav_next_sibling(reader.get(), &root, &root), TAV_RC_NO_MORE_CHILDREN);
  ASSERT_EQ(tav_next_root(reader.get(), &root, &root), TAV_RC_OK);
  EXPECT_EQ(root.offset, first.size() + 100);
  tav_node node{};
  uint64_t number = 0;
  ASSERT_EQ(tav_find(reader.get(), &root, "cpuOnline", &node), TAV_RC_OK);
  EXPECT_EQ(tav_get_u64(reader.get(), &node, &number), TAV_RC_OK);
  EXPECT_EQ(number, 7U);
  ASSERT_EQ(tav_next_sibling(reader.get(), &node, &node), TAV_RC_OK);
  EXPECT_EQ(node.elm, 40001);
  EXPECT_EQ(tav_next_root(reader.get(), &root, &root), TAV_RC_NO_MORE_CHILDREN);
}

TEST(C, FindsEachUntilItIsStopped)
{
  const Bytes bytes = valuesOf();
  const CReader reader = openMemory(bytes);
  ASSERT_NE(reader, nullptr);
  std::vector<uint16_t> elements;
  const auto visit = [](const tav_node* node, void* context) {
    auto& all = *static_cast<std::vector<uint16_t>*>(context);
    all.push_back(node->elm);
    return all.size() == 3 ? 1 : 0;
  };
  EXPECT_EQ(tav_find_each(reader.get(), nullptr, "/system/*", visit, &elements), TAV_RC_OK);
  EXPECT_EQ(elements.size(), 3U);
  EXPECT_EQ(tav_find_each(reader.get(), nullptr, "/system/#1", visit, &elements), TAV_RC_NOT_FOUND);
  EXPECT_THAT(tav_last_message(reader.get()), StrEq(""));
}

TEST(C, StepsOnFromANodeThatAPathOfDotsLeadsTo)
{
  CWriter made(&kNative);
  ASSERT_EQ(tav_begin(made.writer, TAV_ELM_CMN_SYSTEM, 0), TAV_RC_OK);
  ASSERT_EQ(tav_begin(made.writer, TAV_ELM_CMN_HOST, 0), TAV_RC_OK);
  ASSERT_EQ(tav_add_text(made.writer, TAV_ELM_CMN_HOST_NAME, "ada", 3), TAV_RC_OK);
  ASSERT_EQ(tav_end(made.writer), TAV_RC_OK);
  ASSERT_EQ(tav_add_u32(made.writer, TAV_ELM_CMN_CPU_ONLINE, 8), TAV_RC_OK);
  ASSERT_EQ(tav_end(made.writer), TAV_RC_OK);
  const Bytes bytes = made.finish();
  const test::TemporaryPath path;
  test::writeFile(path.path, bytes);
  for (const bool inFile : {false, true})
  {
    SCOPED_TRACE(inFile);
    const CReader reader = inFile ? test::openFile(path.path, &kNative) : openMemory(bytes);
    ASSERT_NE(reader, nullptr);
    tav_node host{};
    tav_node name{};
    ASSERT_EQ(tav_find(reader.get(), nullptr, "/system/host", &host), TAV_RC_OK);
    ASSERT_EQ(tav_find(reader.get(), &host, "hostName", &name), TAV_RC_OK);
    const std::vector<std::pair<const tav_node*, const char*>> ways = {
        {&host, "."}, {&name, ".."}, {&name, "../."}, {&name, "../../host"}, {&host, "/system/host"}};
    for (const auto& [from, way] : ways)
    {
      SCOPED_TRACE(way);
      tav_node found{};
      tav_node next{};
      ASSERT_EQ(tav_find(reader.get(), from, way, &found), TAV_RC_OK);
      EXPECT_EQ(found.offset, host.offset);
      EXPECT_EQ(tav_next_sibling(reader.get(), &found, &next), TAV_RC_OK);
      EXPECT_EQ(next.elm, TAV_ELM_CMN_CPU_ONLINE);
    }
    tav_node root{};
    tav_node next{};
    ASSERT_EQ(tav_find(reader.get(), &name, "../..", &root), TAV_RC_OK);
    EXPECT_EQ(root.offset, 0U);
    EXPECT_EQ(tav_next_sibling(reader.get(), &root, &next), TAV_RC_NO_MORE_CHILDREN);
    EXPECT_EQ(tav_next_root(reader.get(), &root, &next), TAV_RC_NO_MORE_CHILDREN);
  }
}

TEST(C, TellsOfDamageWithOffsetAndPath)
{
  Bytes bytes = valuesOf();
  bytes[16] = 0xFF; // the size of the first child
  bytes[17] = 0xFF;
  const CReader reader = openMemory(bytes);
  ASSERT_NE(reader, nullptr);
  tav_node root{};
  ASSERT_EQ(tav_next_root(reader.get(), nullptr, &root), TAV_RC_OK);
  tav_node node = root;
  EXPECT_EQ(tav_find(reader.get(), nullptr, "/system/hostName", &node), TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(node.offset, root.offset);
  EXPECT_THAT(tav_last_message(reader.get()), StartsWith("memory: 0x10 /system: "));
  EXPECT_THAT(tav_last_message(reader.get()), HasSubstr("TAV_RC_OUTSIDE_PARENT"));
  node = root;
  node.reserved[3] = 0;
  EXPECT_EQ(tav_next_root(reader.get(), nullptr, &root), TAV_RC_OK);
  EXPECT_THAT(tav_last_message(reader.get()), StrEq(""));
}

TEST(C, ReadsElementsThatAreLargerThanTheWindow)
{
  const test::TemporaryPath file;
  const std::string large(size_t{11} << 20U, 'a');
  tav_writer* writer = nullptr;
  ASSERT_EQ(tav_create_file(tav::FilePath(file.path).text().c_str(), nullptr, 0, &writer), TAV_RC_OK);
  EXPECT_EQ(tav_begin(writer, TAV_ELM_CMN_SYSTEM, 0), TAV_RC_OK);
  EXPECT_EQ(tav_add_text(writer, TAV_ELM_CMN_HOST_NAME, large.data(), large.size()), TAV_RC_OK);
  EXPECT_EQ(tav_add_u32(writer, TAV_ELM_CMN_CPU_ONLINE, 7), TAV_RC_OK);
  EXPECT_EQ(tav_end(writer), TAV_RC_OK);
  EXPECT_EQ(tav_finish(&writer, nullptr, nullptr), TAV_RC_OK);
  const CReader reader = openFile(file.path);
  ASSERT_NE(reader, nullptr);
  tav_node node{};
  ASSERT_EQ(tav_next_root(reader.get(), nullptr, &node), TAV_RC_OK);
  ASSERT_EQ(tav_first_child(reader.get(), &node, &node), TAV_RC_OK) << tav_last_message(reader.get());
  EXPECT_EQ(node.payload, nullptr);
  EXPECT_EQ(node.payload_size, 0U);
  EXPECT_EQ(node.size, large.size());
  const char* text = nullptr;
  size_t size = 0;
  EXPECT_EQ(tav_get_text(reader.get(), &node, &text, &size), TAV_RC_DATA_TOO_LARGE);
  std::string copy(large.size() + 10, 'b');
  size = copy.size();
  EXPECT_EQ(tav_read(reader.get(), &node, 0, copy.data(), &size), TAV_RC_OK);
  EXPECT_EQ(size, large.size());
  EXPECT_EQ(copy.substr(0, size), large);
  ASSERT_EQ(tav_next_sibling(reader.get(), &node, &node), TAV_RC_OK) << tav_last_message(reader.get());
  uint64_t number = 0;
  EXPECT_EQ(tav_get_u64(reader.get(), &node, &number), TAV_RC_OK);
  EXPECT_EQ(number, 7U);
  ASSERT_EQ(tav_find(reader.get(), nullptr, "/system/hostName", &node), TAV_RC_OK);
  EXPECT_EQ(node.payload, nullptr);
}

TEST(C, KnowsTheNames)
{
  EXPECT_THAT(tav_tag(TAV_ELM_CMN_HOST_NAME), StrEq("hostName"));
  EXPECT_EQ(tav_tag(40001), nullptr);
  uint16_t elm = 0;
  for (const char* const name : {"hostName", "TAV_ELM_CMN_HOST_NAME", "60103", "#60103"})
  {
    elm = 0;
    EXPECT_EQ(tav_id(name, &elm), TAV_RC_OK);
    EXPECT_EQ(elm, TAV_ELM_CMN_HOST_NAME) << name;
  }
  EXPECT_EQ(tav_id("hosst", &elm), TAV_RC_NOT_FOUND);
  EXPECT_EQ(tav_id("", &elm), TAV_RC_NOT_FOUND);
  EXPECT_EQ(tav_id(nullptr, &elm), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_id("hostName", nullptr), TAV_RC_BAD_PARAM);
  EXPECT_THAT(tav_message(TAV_RC_NOT_FOUND), StrEq("nothing was found, or no group is open"));
  EXPECT_THAT(tav_message(1), StrEq("unknown code"));
}

TEST(CDictionary, NamesOwnElementsForItsReaderAlone)
{
  const test::TemporaryPath file;
  const std::string text = R"({"40001": {"tag": "queueDepth", "kind": "gauge", "unit": "1", "text": "waiting jobs"}})";
  test::writeFile(file.path, Bytes(text.begin(), text.end()));
  const std::string path = tav::FilePath(file.path).text();
  const Bytes bytes = test::valuesOf();
  const CReader reader = openMemory(bytes);
  const CReader other = openMemory(bytes);
  uint16_t elm = 0;
  EXPECT_EQ(tav_reader_id(reader.get(), "queueDepth", &elm), TAV_RC_NOT_FOUND);
  EXPECT_EQ(tav_reader_tag(reader.get(), 40001), nullptr);
  ASSERT_EQ(tav_reader_dictionary(reader.get(), path.c_str()), TAV_RC_OK) << tav_last_message(reader.get());
  EXPECT_EQ(tav_reader_id(reader.get(), "queueDepth", &elm), TAV_RC_OK);
  EXPECT_EQ(elm, 40001);
  EXPECT_STREQ(tav_reader_tag(reader.get(), 40001), "queueDepth");
  EXPECT_STREQ(tav_reader_tag(reader.get(), TAV_ELM_CMN_CPU_ONLINE), "cpuOnline");
  EXPECT_EQ(found(reader, "/system/queueDepth").elm, 40001);
  EXPECT_EQ(tav_reader_tag(other.get(), 40001), nullptr);
  EXPECT_EQ(tav_tag(40001), nullptr);
  tav_node node{};
  EXPECT_NE(tav_find(other.get(), nullptr, "/system/queueDepth", &node), TAV_RC_OK);
}

TEST(CDictionary, RefusesNullsAndWhatIsNoDictionary)
{
  const Bytes bytes = test::valuesOf();
  const CReader reader = openMemory(bytes);
  uint16_t elm = 0;
  EXPECT_EQ(tav_reader_dictionary(nullptr, "x"), TAV_RC_BAD_PARAM);
  EXPECT_NE(tav_reader_dictionary(reader.get(), nullptr), TAV_RC_OK);
  EXPECT_THAT(tav_last_message(reader.get()), HasSubstr("no path was given"));
  EXPECT_EQ(tav_reader_tag(nullptr, TAV_ELM_CMN_CPU_ONLINE), nullptr);
  EXPECT_EQ(tav_reader_id(nullptr, "cpuOnline", &elm), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_reader_id(reader.get(), nullptr, &elm), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_reader_id(reader.get(), "cpuOnline", nullptr), TAV_RC_BAD_PARAM);
  const test::TemporaryPath file;
  test::writeFile(file.path, Bytes{'['});
  EXPECT_NE(tav_reader_dictionary(reader.get(), tav::FilePath(file.path).text().c_str()), TAV_RC_OK);
  EXPECT_STREQ(tav_reader_tag(reader.get(), TAV_ELM_CMN_CPU_ONLINE), "cpuOnline"); // it keeps what it had
}
