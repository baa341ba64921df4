// The exception classes: code text, cloning and re-throwing, application name, CExInfo, instrument errors.
#include <ostrand/errors/Exception.h>
#include <gtest/gtest.h>
#include <tuple>
#include <typeinfo>

using namespace ostrand;

TEST(CWinExceptionTest, ErrorCodeTextIsDecimalOrHexForTheTopBit)
{
    const std::pair<DWORD, const wchar_t*> rows[] = {
        {0, L"0"}, {0x7FFFFFFF, L"2147483647"}, {0x80000000u, L"0x80000000"}, {0x800401F3u, L"0x800401F3"}};
    for (const auto& [code, text] : rows)
        EXPECT_EQ(ustring(text), CWinException(0, NULL, NULL, code).GetErrorCodeStr()) << code;
}

TEST(CStdExceptionTest, CloneAndThrowKeepTheDynamicTypeAndPayload)
{
    const CWinException win(42, L"File", L"CreateFile", ERROR_FILE_NOT_FOUND);
    const CCommException comm(7, L"CommPort", L"Read", L"{2,,dup loop}", L"Receiver");
    // clang-format off
    const std::tuple<const CStdException*, unsigned, const wchar_t*, const wchar_t*, const wchar_t*, const wchar_t*> rows[] = {
        {&win, 42, L"File", L"CreateFile", L"2", L"Win32"}, {&comm, 7, L"CommPort", L"Read", L"{2,,dup loop}", L"Receiver"}};
    // clang-format on
    for (const auto& [original, line, file, function, code, source] : rows)
    {
        const boost::shared_ptr<const CStdException> copy = original->Clone();
        ASSERT_TRUE(copy && copy.get() != original);
        try
        {
            copy->Throw();
            ADD_FAILURE() << "Throw returned";
        }
        catch (const CStdException& e) // the class is abstract: the thrown object has a derived type
        {
            EXPECT_EQ(typeid(*original), typeid(e));
            const CStdException::CExInfo info(e);
            EXPECT_TRUE(info.GetLine() == line && info.GetFileName() == file &&
                        info.GetFunction() == function && info.GetErrorCodeStr() == code &&
                        info.GetSource() == source);
        }
    }
}

TEST(CStdExceptionTest, AppNameFallsBackToTheExecutable)
{
    EXPECT_EQ(ustring(L"ostrand_errors_tests"), CStdException::GetAppName());
    CStdException::SetAppName(L"Surveyor");
    EXPECT_EQ(ustring(L"Surveyor"), CStdException::GetAppName());
    CStdException::SetAppName(nullptr);
    EXPECT_EQ(ustring(L"ostrand_errors_tests"), CStdException::GetAppName());
}

TEST(CExInfoTest, DescribesAndClearKeepsTheAdditionalInfo)
{
    CStdException::CExInfo info(CCommException(9, L"Socket", L"Recv", L"{2,,can't lock}", NULL));
    EXPECT_EQ(ustring(L"Can't lock"), info.GetErrorMessage());
    info.SetAdditionalInfo(L"kept");
    info.Clear();
    EXPECT_TRUE(info.GetLine() == 0 && info.GetFileName().empty() && info.GetFunction().empty() &&
                info.GetErrorCodeStr().empty() && info.GetSource().empty() && info.GetErrorMessage().empty());
    EXPECT_EQ(ustring(L"kept"), info.GetAdditionalInfo());
}

TEST(CCommExceptionTest, TableRowsAndUnknownTexts)
{
    // The first row, the duplicated rows 16 and 33, the last row of another shape; matching is
    // case-sensitive on the whole text, and an unknown text is its own message.
    const std::pair<const wchar_t*, const wchar_t*> rows[] = {
        {L"{2,,wrong command}", L"Wrong command"},
        {L"{2,,incompatible file version}", L"Incompatible file version"},
        {L"{22,Unable to retrieve sourcetable}", L"Unable to retrieve sourcetable"},
        {L"{2,,Wrong command}", L"{2,,Wrong command}"},
        {L"{2,,wrong command} ", L"{2,,wrong command} "},
        {nullptr, L""}};
    for (const auto& [code, expected] : rows)
    {
        ustring message(L"stale");
        EXPECT_TRUE(CCommException(0, NULL, NULL, code).GetErrorMessage(message));
        EXPECT_EQ(ustring(expected), message) << code;
    }
    const CCommException::INT2UI* table = CCommException::m_aINT2UI; // rows 1 and 37, and 16 equal to 33
    EXPECT_TRUE(ustring(table[0].pszErrorCode) == rows[0].first &&
                ustring(table[36].pszErrorCode) == rows[2].first);
    EXPECT_TRUE(ustring(table[15].pszErrorCode) == table[32].pszErrorCode &&
                ustring(table[15].pszMessage) == table[32].pszMessage);
}
