#include <ostrand/text/ustring.h>

#include <gtest/gtest.h>

#include <stdexcept>

using ostrand::ustring;

TEST(UstringTest, PointerConstructionHonoursCountAndNull)
{
    const wchar_t units[] = {L'a', L'b', L'\0', L'c', L'd'};
    EXPECT_EQ(5u, ustring(units, 5).size());
    EXPECT_EQ(2u, ustring(units, ustring::npos).size());
    EXPECT_TRUE(ustring(nullptr, ustring::npos).empty());
    ustring s(L"x");
    s = static_cast<const wchar_t*>(nullptr);
    EXPECT_TRUE(s.empty());
    EXPECT_TRUE(s == static_cast<const wchar_t*>(nullptr));
}

TEST(UstringTest, IndexRejectsSizeItself)
{
    ustring s(L"ab");
    EXPECT_EQ(L'b', s[1]);
    EXPECT_THROW(s[2], std::out_of_range);
    try
    {
        (void)s[2];
        FAIL();
    }
    catch (const std::out_of_range& e)
    {
        EXPECT_STREQ("invalid string position", e.what());
    }
}

TEST(UstringTest, LoadsResourceStringsLongerThanTheFirstBuffer)
{
    HINSTANCE self = ::GetModuleHandleW(NULL);
    ustring s;
    ASSERT_TRUE(s.load(self, 2));
    EXPECT_EQ(304u, s.size());
    EXPECT_EQ(ustring(L"-end"), ustring(s.substr(300)));
    ASSERT_TRUE(s.load(self, 3)); // exactly fills the first buffer: must still load whole
    EXPECT_EQ(255u, s.size());
    EXPECT_FALSE(s.load(self, 4711));
    EXPECT_TRUE(s.empty());
}
