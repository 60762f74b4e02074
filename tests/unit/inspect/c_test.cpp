#include <cstring>
#include <fstream>
#include <memory>
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "cpp/layer.h"
#include "inspect/streams.h"
#include "tav/tav_c.h"

using test::Bytes;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::StartsWith;
using testing::StrEq;

namespace
{

static_assert(sizeof(tav_node) == 80, "bindings without a compiler count on its layout");

constexpr tav_form kNative{test::kBigEndianHost ? uint8_t{2} : uint8_t{1}, 64, 1};

using Reader = std::unique_ptr<tav_reader, decltype(&tav_close)>;

Reader openMemory(const Bytes& bytes, const tav_form* form = &kNative)
{
  tav_reader* reader = nullptr;
  EXPECT_EQ(tav_open_memory(bytes.data(), bytes.size(), form, &reader), TAV_RC_OK);
  return {reader, &tav_close};
}

void writeFile(const std::filesystem::path& path, const Bytes& bytes)
{
  std::ofstream(path, std::ios::binary)
      .write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
}

Reader openFile(const std::filesystem::path& path, const tav_form* form = nullptr)
{
  tav_reader* reader = nullptr;
  EXPECT_EQ(tav_open_file(tav::FilePath(path).text().c_str(), form, &reader), TAV_RC_OK);
  return {reader, &tav_close};
}

/// What a writer in memory makes.
class CWriter
{
public:
  explicit CWriter(const tav_form* form = nullptr)
  {
    EXPECT_EQ(tav_create_memory(form, &writer), TAV_RC_OK);
  }
  ~CWriter()
  {
    tav_discard(&writer);
  }
  CWriter(const CWriter&) = delete;
  CWriter& operator=(const CWriter&) = delete;

  Bytes finish()
  {
    const void* bytes = nullptr;
    size_t size = 0;
    EXPECT_EQ(tav_finish(&writer, &bytes, &size), TAV_RC_OK);
    EXPECT_EQ(writer, nullptr);
    const auto* const first = static_cast<const uint8_t*>(bytes);
    Bytes made(first, first + size);
    tav_free(bytes);
    return made;
  }

  tav_writer* writer = nullptr;
};

/// A stream with a value of every kind.
Bytes valuesOf(const tav_form* form = &kNative)
{
  CWriter made(form);
  tav_writer* const writer = made.writer;
  EXPECT_EQ(tav_begin(writer, TAV_ELM_CMN_SYSTEM, 0), TAV_RC_OK);
  EXPECT_EQ(tav_add_u32(writer, TAV_ELM_CMN_CPU_ONLINE, 7), TAV_RC_OK);
  EXPECT_EQ(tav_add_u64(writer, 40001, UINT64_MAX), TAV_RC_OK);
  EXPECT_EQ(tav_add_i32(writer, 40002, -7), TAV_RC_OK);
  EXPECT_EQ(tav_add_i64(writer, 40003, INT64_MIN), TAV_RC_OK);
  EXPECT_EQ(tav_add_u128(writer, 40004, 1, 2), TAV_RC_OK);
  EXPECT_EQ(tav_add_text(writer, TAV_ELM_CMN_HOST_NAME, "ada", 3), TAV_RC_OK);
  EXPECT_EQ(tav_add_text(writer, TAV_ELM_CMN_OS_NAME, "gr\xC3\xBC\xC3\x9F", 6), TAV_RC_OK);
  EXPECT_EQ(tav_add_bytes(writer, 40005, "\0\1\2", 3), TAV_RC_OK);
  EXPECT_EQ(tav_add_time(writer, 40006, 1709202600123456789), TAV_RC_OK);
  EXPECT_EQ(tav_begin(writer, TAV_ELM_CMN_HOST, kNative.root_bits == 64 ? TAV_INFO_EYE_SIZE : 0), TAV_RC_OK);
  EXPECT_EQ(tav_end(writer), TAV_RC_OK);
  EXPECT_EQ(tav_end(writer), TAV_RC_OK);
  return made.finish();
}

tav_node found(const Reader& reader, const char* path)
{
  tav_node node{};
  EXPECT_EQ(tav_find(reader.get(), nullptr, path, &node), TAV_RC_OK) << tav_last_message(reader.get());
  return node;
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
        const test::TemporaryPath file;
        writeFile(file.path, bytes);
        for (const bool isFile : {false, true})
        {
          const Reader reader = isFile ? openFile(file.path) : openMemory(bytes, &form);
          ASSERT_NE(reader, nullptr);
          tav_form told{};
          ASSERT_EQ(tav_form_of(reader.get(), &told), TAV_RC_OK);
          EXPECT_THAT((std::vector<int>{told.byte_order, told.root_bits, told.aligned}),
                      ElementsAre(order, root, aligned));
          uint64_t number = 0;
          int64_t whole = 0;
          uint64_t high = 0;
          uint64_t low = 0;
          const char* text = nullptr;
          const void* data = nullptr;
          size_t size = 0;
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
          node = found(reader, "/system/osName");
          EXPECT_EQ(tav_get_text(reader.get(), &node, &text, &size), TAV_RC_OK);
          EXPECT_EQ(std::string(text, size), "gr\xC3\xBC\xC3\x9F");
          EXPECT_EQ(tav_get_u64(reader.get(), &node, &number), TAV_RC_NOT_SUPPORTED);
          node = found(reader, "/system/hostName");
          EXPECT_EQ(tav_get_text(reader.get(), &node, &text, &size), TAV_RC_OK);
          EXPECT_EQ(std::string(text, size), "ada");
          EXPECT_EQ(node.payload_size, 3U);
          EXPECT_EQ(std::memcmp(node.payload, "ada", 3), 0);
          node = found(reader, "/system/#40005");
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
    const tav::Reader layer(test::spanOf(bytes), {.byteOrder = tree.form.swap ? tav::ByteOrder::swapped
                                                                              : tav::ByteOrder::native,
                                                  .align8 = tree.form.align,
                                                  .root = tree.form.root32 ? tav::Width::bits32 : tav::Width::bits64});
    std::vector<tav::Node> expected{layer.root()};
    for (const tav::Node& node : layer.root().descendants())
    {
      expected.push_back(node);
    }
    const test::TemporaryPath file;
    writeFile(file.path, bytes);
    for (const bool isFile : {false, true})
    {
      const Reader reader = isFile ? openFile(file.path, &form) : openMemory(bytes, &form);
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

TEST(C, WritesAsTheLayerDoes)
{
  for (const bool swap : {false, true})
  {
    const bool isLittle = swap == test::kBigEndianHost;
    const tav_form form{isLittle ? uint8_t{1} : uint8_t{2}, 64, 2};
    CWriter made(&form);
    tav::Writer writer({.byteOrder = swap ? tav::ByteOrder::swapped : tav::ByteOrder::native, .align8 = true});
    {
      tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = true, .infoKey = 5});
      system.add(TAV_ELM_CMN_HOST_NAME, "ada");
      system.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{8});
      {
        tav::Group gone = system.group(TAV_ELM_CMN_HOST);
        gone.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{9});
        gone.abandon();
      }
      tav::Group host = system.group(TAV_ELM_CMN_HOST);
      host.add(TAV_ELM_CMN_CPU_ONLINE, int64_t{-1});
    }
    writer.finish();
    EXPECT_EQ(tav_begin(made.writer, TAV_ELM_CMN_SYSTEM, TAV_INFO_EYE_SIZE | 5), TAV_RC_OK);
    EXPECT_EQ(tav_add_text(made.writer, TAV_ELM_CMN_HOST_NAME, "ada", 3), TAV_RC_OK);
    EXPECT_EQ(tav_add_u32(made.writer, TAV_ELM_CMN_CPU_ONLINE, 8), TAV_RC_OK);
    EXPECT_EQ(tav_begin(made.writer, TAV_ELM_CMN_HOST, 0), TAV_RC_OK);
    EXPECT_EQ(tav_add_u32(made.writer, TAV_ELM_CMN_CPU_ONLINE, 9), TAV_RC_OK);
    EXPECT_EQ(tav_abandon(made.writer), TAV_RC_OK);
    EXPECT_EQ(tav_begin(made.writer, TAV_ELM_CMN_HOST, 0), TAV_RC_OK);
    EXPECT_EQ(tav_add_i64(made.writer, TAV_ELM_CMN_CPU_ONLINE, -1), TAV_RC_OK);
    EXPECT_EQ(tav_end(made.writer), TAV_RC_OK);
    EXPECT_EQ(tav_end(made.writer), TAV_RC_OK);
    EXPECT_EQ(made.finish(), test::bytesOf(writer.bytes()));
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
  const Reader reader = openMemory(bytes, nullptr);
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
  const Reader reader = openMemory(bytes);
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

TEST(C, TellsOfDamageWithOffsetAndPath)
{
  Bytes bytes = valuesOf();
  bytes[16] = 0xFF; // the size of the first child
  bytes[17] = 0xFF;
  const Reader reader = openMemory(bytes);
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

TEST(C, RefusesBadArguments)
{
  const Bytes bytes = valuesOf();
  const Reader reader = openMemory(bytes);
  const Reader other = openMemory(bytes);
  tav_node root{};
  ASSERT_EQ(tav_next_root(reader.get(), nullptr, &root), TAV_RC_OK);
  tav_node foreign{};
  ASSERT_EQ(tav_next_root(other.get(), nullptr, &foreign), TAV_RC_OK);
  tav_node zero{};
  tav_node out{};
  uint64_t number = 0;
  int64_t whole = 0;
  const char* text = nullptr;
  const void* data = nullptr;
  size_t size = 1;
  char room = 0;
  const auto visit = [](const tav_node*, void*) { return 0; };
  for (const tav_node* const bad : {static_cast<const tav_node*>(nullptr), const_cast<const tav_node*>(&foreign),
                                    const_cast<const tav_node*>(&zero)})
  {
    EXPECT_EQ(tav_first_child(reader.get(), bad, &out), TAV_RC_BAD_PARAM);
    EXPECT_THAT(tav_last_message(reader.get()), HasSubstr("TAV_RC_BAD_PARAM"));
    EXPECT_EQ(tav_next_sibling(reader.get(), bad, &out), TAV_RC_BAD_PARAM);
    EXPECT_EQ(tav_get_u64(reader.get(), bad, &number), TAV_RC_BAD_PARAM);
    EXPECT_EQ(tav_get_i64(reader.get(), bad, &whole), TAV_RC_BAD_PARAM);
    EXPECT_EQ(tav_get_u128(reader.get(), bad, &number, &number), TAV_RC_BAD_PARAM);
    EXPECT_EQ(tav_get_time(reader.get(), bad, &whole), TAV_RC_BAD_PARAM);
    EXPECT_EQ(tav_get_text(reader.get(), bad, &text, &size), TAV_RC_BAD_PARAM);
    EXPECT_EQ(tav_get_bytes(reader.get(), bad, &data, &size), TAV_RC_BAD_PARAM);
    EXPECT_EQ(tav_read(reader.get(), bad, 0, &room, &size), TAV_RC_BAD_PARAM);
    if (bad != nullptr)
    {
      EXPECT_EQ(tav_next_root(reader.get(), bad, &out), TAV_RC_BAD_PARAM);
      EXPECT_EQ(tav_find(reader.get(), bad, "cpuOnline", &out), TAV_RC_BAD_PARAM);
      EXPECT_EQ(tav_find_each(reader.get(), bad, "cpuOnline", visit, nullptr), TAV_RC_BAD_PARAM);
    }
  }
  EXPECT_EQ(tav_next_root(nullptr, nullptr, &out), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_next_root(reader.get(), nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_first_child(nullptr, &root, &out), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_first_child(reader.get(), &root, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_next_sibling(nullptr, &root, &out), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_next_sibling(reader.get(), &root, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_find(nullptr, nullptr, "/", &out), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_find(reader.get(), nullptr, nullptr, &out), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_find(reader.get(), nullptr, "/", nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_find(reader.get(), nullptr, "/hosst", &out), TAV_RC_BAD_PARAM);
  EXPECT_THAT(tav_last_message(reader.get()), HasSubstr("hosst"));
  EXPECT_EQ(tav_find(reader.get(), nullptr, "a[", &out), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_find_each(nullptr, nullptr, "/", visit, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_find_each(reader.get(), nullptr, nullptr, visit, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_find_each(reader.get(), nullptr, "/", nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_u64(nullptr, &root, &number), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_u64(reader.get(), &root, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_i64(nullptr, &root, &whole), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_i64(reader.get(), &root, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_u128(nullptr, &root, &number, &number), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_u128(reader.get(), &root, nullptr, &number), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_u128(reader.get(), &root, &number, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_time(nullptr, &root, &whole), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_time(reader.get(), &root, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_text(nullptr, &root, &text, &size), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_text(reader.get(), &root, nullptr, &size), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_text(reader.get(), &root, &text, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_bytes(nullptr, &root, &data, &size), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_bytes(reader.get(), &root, nullptr, &size), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_bytes(reader.get(), &root, &data, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_read(nullptr, &root, 0, &room, &size), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_read(reader.get(), &root, 0, nullptr, &size), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_read(reader.get(), &root, 0, &room, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_form_of(nullptr, nullptr), TAV_RC_BAD_PARAM);
  tav_form form{};
  EXPECT_EQ(tav_form_of(nullptr, &form), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_form_of(reader.get(), nullptr), TAV_RC_BAD_PARAM);
  EXPECT_THAT(tav_last_message(nullptr), StrEq(""));
  tav_close(nullptr);
}

TEST(C, RefusesToOpenWhatIsNoStream)
{
  const Bytes bytes = valuesOf();
  auto* const before = reinterpret_cast<tav_reader*>(1);
  tav_reader* reader = before;
  EXPECT_EQ(tav_open_memory(nullptr, 5, nullptr, &reader), TAV_RC_BAD_PARAM);
  EXPECT_EQ(reader, nullptr);
  EXPECT_EQ(tav_open_memory(bytes.data(), bytes.size(), nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_open_file(nullptr, nullptr, &reader), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_open_file("x", nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_open_memory(bytes.data(), 0, nullptr, &reader), TAV_RC_NOT_FOUND);
  for (const tav_form& bad : {tav_form{3, 0, 0}, tav_form{0, 16, 0}, tav_form{0, 0, 3}})
  {
    reader = before;
    EXPECT_EQ(tav_open_memory(bytes.data(), bytes.size(), &bad, &reader), TAV_RC_BAD_PARAM);
    EXPECT_EQ(reader, nullptr);
    tav_writer* writer = nullptr;
    EXPECT_EQ(tav_create_memory(&bad, &writer), TAV_RC_BAD_PARAM);
    EXPECT_EQ(tav_create_file("x", &bad, 0, &writer), TAV_RC_BAD_PARAM);
  }
  const test::TemporaryPath file;
  EXPECT_EQ(tav_open_file(tav::FilePath(file.path).text().c_str(), nullptr, &reader), KOR_RC_NO_SUCH_FILE);
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
  const Reader reader = openFile(file.path);
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

TEST(C, RefusesWrongStepsOfAWriter)
{
  CWriter made;
  tav_writer* const writer = made.writer;
  EXPECT_EQ(tav_end(writer), TAV_RC_NOT_FOUND);
  EXPECT_THAT(tav_writer_message(writer), HasSubstr("no group is open"));
  EXPECT_EQ(tav_abandon(writer), TAV_RC_NOT_FOUND);
  EXPECT_EQ(tav_add_u32(writer, 1, 1), TAV_RC_NOT_FOUND);
  ASSERT_EQ(tav_begin(writer, TAV_ELM_CMN_SYSTEM, 0), TAV_RC_OK);
  EXPECT_THAT(tav_writer_message(writer), StrEq(""));
  const void* bytes = nullptr;
  size_t size = 0;
  EXPECT_EQ(tav_finish(&made.writer, &bytes, &size), TAV_RC_BAD_PARAM);
  EXPECT_EQ(made.writer, writer);
  EXPECT_THAT(tav_writer_message(writer), HasSubstr("open"));
  EXPECT_EQ(tav_add_text(writer, 1, "\xFF", 1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_text(writer, 1, nullptr, 0), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_bytes(writer, 1, nullptr, 0), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_time(writer, 1, -1), TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(tav_flush(writer), TAV_RC_OK);
  EXPECT_EQ(tav_sync(writer), TAV_RC_OK);
  EXPECT_EQ(tav_end(writer), TAV_RC_OK);
  EXPECT_EQ(tav_finish(&made.writer, nullptr, &size), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_finish(&made.writer, &bytes, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(made.finish().size(), 16U);
  EXPECT_EQ(tav_finish(&made.writer, &bytes, &size), TAV_RC_BAD_PARAM);
}

TEST(C, RefusesAWriterThatIsNone)
{
  tav_writer* none = nullptr;
  const void* bytes = nullptr;
  size_t size = 0;
  EXPECT_EQ(tav_create_memory(nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_create_file("x", nullptr, 0, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_create_file(nullptr, nullptr, 0, &none), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_create_file("x", nullptr, 3, &none), TAV_RC_BAD_OPTIONS);
  EXPECT_EQ(tav_create_file("x", nullptr, 4, &none), TAV_RC_BAD_OPTIONS);
  EXPECT_EQ(tav_begin(nullptr, 1, 0), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_end(nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_abandon(nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_u32(nullptr, 1, 1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_u64(nullptr, 1, 1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_i32(nullptr, 1, 1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_i64(nullptr, 1, 1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_u128(nullptr, 1, 1, 1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_text(nullptr, 1, "a", 1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_text(nullptr, 1, nullptr, 1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_bytes(nullptr, 1, "a", 1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_time(nullptr, 1, 1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_time(nullptr, 1, -1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_flush(nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_sync(nullptr), TAV_RC_BAD_PARAM);
  EXPECT_THAT(tav_writer_message(nullptr), StrEq(""));
  EXPECT_EQ(tav_finish(nullptr, &bytes, &size), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_finish(&none, &bytes, &size), TAV_RC_BAD_PARAM);
  tav_discard(nullptr);
  tav_discard(&none);
  tav_free(nullptr);
}

TEST(C, KeepsAFileThatIsNotToBeOverwritten)
{
  const test::TemporaryPath file;
  writeFile(file.path, {1, 2, 3});
  const std::string path = tav::FilePath(file.path).text();
  tav_writer* writer = nullptr;
  EXPECT_EQ(tav_create_file(path.c_str(), nullptr, 0, &writer), KOR_RC_FILE_EXISTS);
  EXPECT_EQ(writer, nullptr);
  ASSERT_EQ(tav_create_file(path.c_str(), nullptr, TAV_CREATE_OVERWRITE, &writer), TAV_RC_OK);
  EXPECT_EQ(tav_begin(writer, TAV_ELM_CMN_SYSTEM, 0), TAV_RC_OK);
  tav_discard(&writer);
  EXPECT_EQ(writer, nullptr);
  EXPECT_EQ(std::filesystem::file_size(file.path), 3U);
  ASSERT_EQ(tav_create_file(path.c_str(), nullptr, TAV_CREATE_OVERWRITE, &writer), TAV_RC_OK);
  EXPECT_EQ(tav_begin(writer, TAV_ELM_CMN_SYSTEM, 0), TAV_RC_OK);
  EXPECT_EQ(tav_end(writer), TAV_RC_OK);
  const void* bytes = &path;
  size_t size = 1;
  EXPECT_EQ(tav_finish(&writer, &bytes, &size), TAV_RC_OK);
  EXPECT_EQ(bytes, nullptr);
  EXPECT_EQ(size, 0U);
  EXPECT_NE(openFile(file.path), nullptr);
}

TEST(C, GoesOnInAFileInTheFormThatItHas)
{
  const test::TemporaryPath file;
  const std::string path = tav::FilePath(file.path).text();
  const tav_form narrow{test::kBigEndianHost ? uint8_t{1} : uint8_t{2}, 32, 1};
  tav_writer* writer = nullptr;
  for (const tav_form* const form : {&narrow, static_cast<const tav_form*>(nullptr), &narrow})
  {
    ASSERT_EQ(tav_create_file(path.c_str(), form, TAV_CREATE_APPEND, &writer), TAV_RC_OK);
    EXPECT_EQ(tav_begin(writer, TAV_ELM_CMN_SYSTEM, 0), TAV_RC_OK);
    EXPECT_EQ(tav_add_u32(writer, TAV_ELM_CMN_CPU_ONLINE, 8), TAV_RC_OK);
    EXPECT_EQ(tav_flush(writer), TAV_RC_OK) << tav_writer_message(writer);
    EXPECT_EQ(tav_sync(writer), TAV_RC_OK) << tav_writer_message(writer);
    EXPECT_EQ(tav_end(writer), TAV_RC_OK);
    ASSERT_EQ(tav_finish(&writer, nullptr, nullptr), TAV_RC_OK);
  }
  const auto written = std::filesystem::file_size(file.path);
  EXPECT_EQ(tav_create_file(path.c_str(), &kNative, TAV_CREATE_APPEND, &writer), TAV_RC_BAD_OPTIONS);
  EXPECT_EQ(std::filesystem::file_size(file.path), written);

  const Reader reader = openFile(file.path, &narrow);
  tav_node root{};
  unsigned roots = 0;
  for (const tav_node* last = nullptr; tav_next_root(reader.get(), last, &root) == TAV_RC_OK; last = &root) ++roots;
  EXPECT_EQ(roots, 3U);
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
