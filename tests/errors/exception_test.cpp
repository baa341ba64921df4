#include <ostrand/errors/Exception.h>

#include <gtest/gtest.h>

using namespace ostrand;

TEST(CWinExceptionTest, CloneThrowKeepsTheDynamicType)
{
    const CWinException original(42, L"File", L"CreateFile", ERROR_FILE_NOT_FOUND);
    const CStdException& base = original;
    boost::shared_ptr<const CStdException> copy = base.Clone();
    try
    {
        copy->Throw();
        FAIL() << "Throw returned";
    }
    catch (const CWinException& e)
    {
        EXPECT_EQ(42u, e.GetLine());
        EXPECT_EQ(ustring(L"File"), e.GetFileName());
        EXPECT_EQ(ustring(L"CreateFile"), e.GetFunction());
        EXPECT_EQ(static_cast<DWORD>(ERROR_FILE_NOT_FOUND), e.GetErrorCode());
    }
}

TEST(CWinExceptionTest, ErrorCodeTextIsDecimalOrHexForTheTopBit)
{
    EXPECT_EQ(ustring(L"0"), CWinException().GetErrorCodeStr());
    EXPECT_EQ(ustring(L"2"), CWinException(0, NULL, NULL, 2).GetErrorCodeStr());
    EXPECT_EQ(ustring(L"0x80004005"), CWinException(0, NULL, NULL, 0x80004005u).GetErrorCodeStr());
}

TEST(CWinExceptionTest, SourceIsTheLibraryResourceText)
{
    ustring source;
    EXPECT_TRUE(CWinException().GetSource(source));
    EXPECT_EQ(ustring(L"Win32"), source);
}
