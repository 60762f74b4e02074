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

/// The message of the error that a call throws; empty without one.
template<class Call>
std::string messageOf(const Call& call)
{
  try
  {
    call();
  }
  catch (const std::system_error& error)
  {
    return error.what();
  }
  return {};
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
