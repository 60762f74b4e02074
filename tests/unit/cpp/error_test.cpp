#include <gmock/gmock.h>

#include "cpp/layer.h"

using namespace test;

TEST(LayerErrors, MessageNamesTheCodeAndSaysWhatItMeans)
{
  EXPECT_EQ(tav::makeError(TAV_RC_NOT_FOUND).message(), "TAV_RC_NOT_FOUND: nothing was found, or no group is open");
}

TEST(LayerErrors, EveryCodeHasANameAndASentence)
{
  for (const uint32_t code : {
#define CODE_ITSELF(name, value, sentence) name,
           TAV_CODE_LIST(CODE_ITSELF)
#undef CODE_ITSELF
       })
  {
    const std::string message = tav::category().message(static_cast<int>(code));
    EXPECT_THAT(message, ::testing::StartsWith(std::string(korCodeName(code)) + ": ")) << code;
    EXPECT_GT(message.size(), std::string(korCodeName(code)).size() + 2) << code;
  }
}

TEST(LayerErrors, UnknownCodeHasAMessageToo)
{
  EXPECT_EQ(tav::makeError(0x12345678).message(), "unknown code");
}

TEST(LayerErrors, CategoryIsCalledTav)
{
  EXPECT_STREQ(tav::category().name(), "tav");
}

TEST(LayerErrors, SuccessIsNoError)
{
  EXPECT_FALSE(tav::makeError(TAV_RC_OK));
}

TEST(LayerErrors, CodeComesBackOutOfAnError)
{
  EXPECT_EQ(tav::codeOf(tav::makeError(TAV_RC_OUTSIDE_PARENT)), TAV_RC_OUTSIDE_PARENT);
}

TEST(LayerErrors, ErrorOfAnotherCategoryHasNoCode)
{
  EXPECT_EQ(tav::codeOf(std::make_error_code(std::errc::io_error)), TAV_RC_OK);
}

TEST(LayerErrors, CompareWithPortableConditions)
{
  EXPECT_EQ(tav::makeError(KOR_RC_NO_SUCH_FILE), std::errc::no_such_file_or_directory);
  EXPECT_EQ(tav::makeError(KOR_RC_NO_SPACE), std::errc::no_space_on_device);
  EXPECT_EQ(tav::makeError(TAV_RC_NO_MEMORY), std::errc::not_enough_memory);
  EXPECT_EQ(tav::makeError(TAV_RC_NOT_SUPPORTED), std::errc::not_supported);
  EXPECT_EQ(tav::makeError(TAV_RC_BAD_PARAM), std::errc::invalid_argument);
  EXPECT_EQ(tav::makeError(KOR_RC_NO_PERMISSION), std::errc::permission_denied);
  EXPECT_EQ(tav::makeError(KOR_RC_IS_FOLDER), std::errc::is_a_directory);
  EXPECT_EQ(tav::makeError(KOR_RC_IO_ERROR), std::errc::io_error);
  EXPECT_EQ(tav::makeError(KOR_RC_FILE_EXISTS), std::errc::file_exists);
  EXPECT_NE(tav::makeError(TAV_RC_NOT_FOUND), std::errc::no_such_file_or_directory);
}

TEST(LayerErrors, NameTheFile)
{
  const TemporaryPath missing;
  const std::string name = missing.path.string();
  const std::string why = ": KOR_RC_NO_SUCH_FILE: no such file or folder";
  EXPECT_EQ(messageOf([&] { tav::Reader{missing.path}; }), "opening for reading " + name + why);
  EXPECT_EQ(messageOf([&] { tav::Updater{missing.path}; }), "opening for updating " + name + why);
  EXPECT_EQ(messageOf([&] { tav::Writer{missing.path / "below"}; }),
            "opening for writing " + (missing.path / "below").string() + why);
}

TEST(LayerErrors, NameTheNodeWhoseValueIsOfAnotherType)
{
  tav::Writer writer;
  tav::Group root = writer.group(TAV_ELM_CMN_HOST);
  const tav::HeaderView name = root.add(TAV_ELM_CMN_HOST_NAME, "ada");
  root.close();
  EXPECT_EQ(messageOf([&] { writer.update(name, uint32_t{1}); }).substr(0, 59),
            "updating hostName (60103) at 0x10, type 50, 3 bytes: TAV_RC");
  writer.finish();
  const tav::Reader reader(writer.bytes());
  const tav::Node node = *reader.path("/host/hostName");
  const std::string said = "reading hostName (60103) at 0x10, type 50, 3 bytes: TAV_RC_NOT_SUPPORTED: ";
  EXPECT_THAT(messageOf([&] { static_cast<void>(node.as<uint32_t>()); }), ::testing::StartsWith(said));
  EXPECT_THAT(messageOf([&] { static_cast<void>(node.asNumber<int>()); }), ::testing::StartsWith(said));
  EXPECT_THAT(messageOf([&] { static_cast<void>(node.copy().as<uint32_t>()); }), ::testing::StartsWith(said));
}

TEST(LayerErrors, NameTheElementThatCannotBeAdded)
{
  std::array<std::byte, 40> block{};
  tav::Writer writer{std::span<std::byte>(block)};
  tav::Group root = writer.group(TAV_ELM_CMN_HOST);
  const std::string why = ": TAV_RC_END_OF_STORAGE: the end of the storage was reached";
  EXPECT_EQ(messageOf([&] { root.add(TAV_ELM_CMN_HOST_NAME, "a name that is too long"); }),
            "adding hostName (60103)" + why);
  EXPECT_EQ(messageOf([&] { root.add<TAV_TYPE_UINT64>(59999, 5); }), "adding element 59999" + why);
  root.add(TAV_ELM_CMN_HOST_NAME, "a");
  EXPECT_EQ(messageOf([&] { static_cast<void>(root.group(TAV_ELM_CMN_HOST)); }),
            "opening the group host (60102)" + why);
}

TEST(LayerErrors, NameThePathThatIsNone)
{
  EXPECT_THAT(messageOf([] { tav::Path{"/host/noSuchName"}; }),
              ::testing::StartsWith("understanding the path /host/noSuchName: TAV_RC_BAD_PARAM: "));
  tav::Writer writer;
  writer.group(TAV_ELM_CMN_HOST).close();
  writer.finish();
  const tav::Reader reader(writer.bytes());
  EXPECT_THAT(messageOf([&] { static_cast<void>(reader.path("/noSuchName")); }),
              ::testing::StartsWith("searching /noSuchName: TAV_RC_BAD_PARAM: "));
}

TEST(LayerErrors, SayWhichGroupIsStillOpen)
{
  tav::Writer writer;
  const std::string finishing = "finishing a stream: TAV_RC_BAD_PARAM: ";
  tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  EXPECT_EQ(messageOf([&] { writer.finish(); }), finishing + "the group system (60100) at 0x0 is still open");
  tav::Group host = root.group(TAV_ELM_CMN_HOST);
  EXPECT_EQ(messageOf([&] { writer.finish(); }),
            finishing + "the group host (60102) at 0x10 and 1 around it are still open");
  EXPECT_EQ(messageOf([&] { root.add(TAV_ELM_CMN_HOST_NAME, "x"); }),
            "adding hostName (60103): TAV_RC_BAD_PARAM: the group host (60102) at 0x10, inside it, is still open");
  EXPECT_EQ(messageOf([&] { static_cast<void>(root.group(TAV_ELM_CMN_OS)); }),
            "opening the group os (60104): TAV_RC_BAD_PARAM: the group host (60102) at 0x10, inside it, is still open");
  EXPECT_EQ(messageOf([&] { root.close(); }),
            "closing a group: TAV_RC_BAD_PARAM: the group host (60102) at 0x10, inside it, is still open");
  host.close();
  EXPECT_EQ(messageOf([&] { host.add(TAV_ELM_CMN_HOST_NAME, "x"); }),
            "adding hostName (60103): TAV_RC_BAD_PARAM: the group is closed");
  EXPECT_EQ(messageOf([&] { host.addStream(tav::Width::bits64, {}); }),
            "adding encoded nodes: TAV_RC_BAD_PARAM: the group is closed");
  root.close();
  writer.finish();
  EXPECT_EQ(messageOf([&] { static_cast<void>(writer.group(TAV_ELM_CMN_OS)); }),
            "opening the group os (60104): TAV_RC_BAD_PARAM: the stream is finished");
}

TEST(LayerErrors, SayWhyAValueWasRefused)
{
  tav::Writer writer;
  tav::Group root = writer.group(TAV_ELM_CMN_HOST);
  const std::string adding = "adding hostName (60103): ";
  const auto added = [&](const auto& value) { return messageOf([&] { root.add(TAV_ELM_CMN_HOST_NAME, value); }); };
  EXPECT_THAT(added("\xFF"), ::testing::StartsWith(adding + "TAV_RC_BAD_PARAM: the text is neither ASCII nor UTF-8"));
  EXPECT_EQ(added(static_cast<const char*>(nullptr)), adding + "TAV_RC_BAD_PARAM: the text is a null pointer");
  EXPECT_EQ(added(std::chrono::sys_seconds(std::chrono::seconds(-1))),
            adding + "TAV_RC_OUTSIDE_PARENT: a time before 1970, or too late for a timestamp");
  EXPECT_EQ(messageOf([&] { root.add<TAV_TYPE_UINT8>(TAV_ELM_CMN_HOST_NAME, 256); }),
            adding + "TAV_RC_OUTSIDE_PARENT: the number does not fit the type");
  EXPECT_EQ(messageOf([&] { root.add(TAV_ELM_CMN_HOST_NAME, 1, {.infoKey = 2048}); }),
            adding + "TAV_RC_BAD_PARAM: the key does not fit 11 bits");
  EXPECT_EQ(messageOf([&] { root.add(70000, 1); }),
            "adding element 70000: TAV_RC_BAD_PARAM: ids of elements go from 0 to 65535");
  EXPECT_EQ(messageOf([&] { root.addRaw(TAV_TYPE_HEADER64, TAV_ELM_CMN_HOST_NAME, {}); }),
            adding + "TAV_RC_BAD_PARAM: the type is a group's: group() opens one");
}

TEST(LayerErrors, SayHowAValueCanBeRead)
{
  tav::Writer writer;
  {
    tav::Group root = writer.group(TAV_ELM_CMN_HOST);
    root.add(TAV_ELM_CMN_CPU_ONLINE, int32_t{-5});
    root.add(TAV_ELM_CMN_HOST_NAME, "ada");
    root.add(TAV_ELM_CMN_OS, std::byte{1});
    root.addRaw(TAV_TYPE_UINT32, TAV_ELM_CMN_OS_NAME, std::array<std::byte, 3>{});
    root.addRaw(999, TAV_ELM_CMN_MACHINE_ID, {});
  }
  writer.finish();
  const tav::Reader reader(writer.bytes());
  const auto read = [&]<class T>(const char* name, std::type_identity<T>) {
    const std::string said = messageOf([&] { static_cast<void>(reader.path(name)->as<T>()); });
    return said.substr(std::min(said.size(), said.find("TAV_RC")));
  };
  constexpr std::type_identity<uint32_t> number;
  EXPECT_EQ(read("/host/cpuOnline", number), "TAV_RC_NOT_SUPPORTED: the node is a Sint32: asNumber<uint32_t>()");
  EXPECT_EQ(read("/host/cpuOnline", std::type_identity<std::string>()),
            "TAV_RC_NOT_SUPPORTED: the node is a Sint32: as<int32_t>()");
  EXPECT_EQ(read("/host/hostName", number), "TAV_RC_NOT_SUPPORTED: the node is an ASCII String: as<std::string>()");
  EXPECT_EQ(read("/host/os", number), "TAV_RC_NOT_SUPPORTED: the node is a Byte: as<std::byte>()");
  EXPECT_EQ(read("/host/osName", number), "TAV_RC_OUTSIDE_PARENT: the node is a Uint32 of another size");
  EXPECT_EQ(read("/host/machineId", number), "TAV_RC_NOT_SUPPORTED: the node is of type 999: payload()");
  EXPECT_EQ(read("/host", number), "TAV_RC_NOT_SUPPORTED: the node is a group");
  EXPECT_THAT(messageOf([&] { static_cast<void>(reader.path("/host/cpuOnline")->asNumber<uint32_t>()); }),
              ::testing::EndsWith("TAV_RC_OUTSIDE_PARENT: the node's value does not fit"));
}

TEST(LayerErrors, SayWhatAnUpdateLacks)
{
  tav::Writer writer;
  tav::Group root = writer.group(TAV_ELM_CMN_HOST);
  const tav::HeaderView name = root.add(TAV_ELM_CMN_HOST_NAME, "ada");
  const std::string updating = "updating hostName (60103) at 0x10, type 50, 3 bytes: ";
  EXPECT_EQ(messageOf([&] { writer.update(name, "grace"); }),
            updating + "TAV_RC_OUTSIDE_PARENT: the node has 3 bytes, the value 5");
  EXPECT_EQ(messageOf([&] { writer.update(name, 1); }),
            updating + "TAV_RC_NOT_SUPPORTED: the node is an ASCII String, the value a Sint32");
  EXPECT_EQ(messageOf([&] { writer.update(name, "\xC3\xA4!"); }),
            updating + "TAV_RC_NOT_SUPPORTED: the node is an ASCII String, the value a UTF8 String");
  tav::Writer other;
  tav::Group group = other.group(TAV_ELM_CMN_HOST);
  group.add(TAV_ELM_CMN_OS_NAME, "ada");
  EXPECT_EQ(messageOf([&] { other.update(name, "bob"); }), updating + "TAV_RC_BAD_PARAM: the stream has no such node");
  const tav::HeaderView text = root.add(TAV_ELM_CMN_HOST_NAME, "\xC3\xA4");
  EXPECT_NO_THROW(writer.update(text, "ab")) << "ASCII is UTF-8, too";
}

TEST(LayerErrors, NameTheColumnOfAPathThatIsNone)
{
  const auto said = [](const char* path) {
    const std::string all = messageOf([&] { tav::Path{path}; });
    return all.substr(all.find("PARAM: ") + 7);
  };
  const std::pair<const char*, const char*> rows[] = {
      {"/host/hostNam", "column 7: no element is called 'hostNam'; did you mean hostName?"},
      {"/host/nothingLikeThisAtAll", "column 7: no element is called 'nothingLikeThisAtAll'"},
      {"host/70000", "column 6: '70000' is no id; they go from 0 to 65535"},
      {"host///hostName", "column 7: a step is empty"},
      {"", "column 1: a step is empty"},
      {"/host/hostName[1", "column 15: a [ without a ]"},
      {"/host/hostName[2]x", "column 18: 'x' does not belong here"},
      {"/host/hostName[x]", "column 16: no element is called 'x'"},
      {"/host/hostName[0]", "column 16: '0' is no place; the first is [1]"},
      {"/h\xC3\xB6st/\xC3\xA4", "column 2: no element is called 'h\xC3\xB6st'; did you mean host?"},
  };
  for (const auto& [path, what] : rows)
  {
    EXPECT_EQ(said(path), what);
  }
}
