/// Names of files in every form in which a program has them.
#include <chrono>
#include <filesystem>
#include <fstream>
#include <string>

#include <gtest/gtest.h>

#include "cpp/layer.h"

using namespace test;

namespace
{

constexpr const char* kName = "na\xC3\xAFve-\xF0\x9D\x84\x9E"; // two bytes, and four: a pair in UTF-16

template<class Name>
concept NamesAFile = std::is_convertible_v<const Name&, tav::FilePath>;

} // namespace

TEST(FileName, IsTheSameInEveryForm)
{
  const std::string narrow = kName;
  const std::u8string utf8 = u8"na\u00EFve-\U0001D11E";
  const std::wstring wide = L"na\u00EFve-\U0001D11E";
  const std::u16string utf16 = u"na\u00EFve-\U0001D11E";
  const std::u32string utf32 = U"na\u00EFve-\U0001D11E";
  for (const tav::FilePath& path :
       {tav::FilePath(kName), tav::FilePath(narrow), tav::FilePath(std::string_view(narrow)), tav::FilePath(utf8),
        tav::FilePath(utf8.c_str()), tav::FilePath(wide), tav::FilePath(wide.c_str()), tav::FilePath(utf16),
        tav::FilePath(utf32), tav::FilePath(std::filesystem::path(utf8))})
  {
    EXPECT_EQ(path.text(), kName);
    EXPECT_STREQ(path.c_str(), kName);
  }
}

TEST(FileName, OfAnEntryOfAFolderIsItsPath)
{
  const TemporaryPath file;
  std::ofstream(file.path) << 'x';
  const std::filesystem::directory_entry entry(file.path);
  EXPECT_EQ(tav::FilePath(entry).text(), tav::FilePath(file.path).text());
  EXPECT_EQ(thrownBy([&] { tav::Reader reader(entry); }), TAV_RC_OK);
}

TEST(FileName, ThatIsNoTextIsRefused)
{
  for (const std::u16string& broken :
       {std::u16string(u"x\xD834"), std::u16string(u"\xDD1Ex"), std::u16string(u"\xD834x")})
  {
    EXPECT_EQ(thrownBy([&] { tav::FilePath path(broken); }), KOR_RC_BAD_NAME);
  }
  EXPECT_EQ(thrownBy([&] { tav::FilePath path(std::u32string(1, char32_t{0x110000})); }), KOR_RC_BAD_NAME);
  EXPECT_EQ(thrownBy([&] { tav::FilePath path(std::u32string(1, char32_t{0xD834})); }), KOR_RC_BAD_NAME);
}

TEST(FileName, IsNoOtherThing)
{
  static_assert(NamesAFile<const char*> && NamesAFile<char[4]> && NamesAFile<std::filesystem::path>);
  static_assert(!NamesAFile<std::nullptr_t> && !NamesAFile<int> && !NamesAFile<Bytes> && !NamesAFile<tav::Node>);
  static_assert(!std::is_default_constructible_v<tav::FilePath>);
}

TEST(FileName, OpensTheFileThatItNames)
{
  const TemporaryPath folder;
  std::filesystem::create_directory(folder.path);
  const std::filesystem::path path = folder.path / u8"na\u00EFve";
  {
    tav::Writer writer(path.u16string());
    writer.group(TAV_ELM_CMN_SYSTEM).add(TAV_ELM_CMN_CPU_ONLINE, 8U);
    writer.finish();
  }
  EXPECT_TRUE(std::filesystem::exists(path));
  {
    const tav::Reader reader(path.u8string());
    EXPECT_EQ(reader.root().elm(), TAV_ELM_CMN_SYSTEM);
  }
  tav::Updater(path.u32string()).finish();
  std::filesystem::remove_all(folder.path);
}

TEST(TimePoint, IsAValueOnlyOfTheSystemsClock)
{
  using namespace std::chrono;
  static_assert(tav::detail::Addable<system_clock::time_point> && tav::detail::Addable<sys_days>);
  static_assert(tav::detail::Addable<sys_time<duration<double>>> && tav::Readable<sys_seconds>);
  static_assert(!tav::detail::Addable<steady_clock::time_point> && !tav::detail::Addable<local_seconds>);
  static_assert(!tav::detail::Addable<std::filesystem::file_time_type> && !tav::detail::Addable<seconds>);
  static_assert(!tav::Readable<steady_clock::time_point> && !tav::Readable<std::filesystem::file_time_type>);
}

TEST(TimePoint, HasTheDateOfTheCalendar)
{
  using namespace std::chrono;
  for (int64_t day = -800'000; day < 3'000'000; ++day) // from before the year 0 to behind 9999
  {
    const year_month_day expected{sys_days(days(day))};
    const tav::detail::Date date = tav::detail::dateOf(day);
    ASSERT_TRUE(date.year == int{expected.year()} && date.month == unsigned{expected.month()} &&
                date.day == unsigned{expected.day()})
        << "day " << day;
  }
}
