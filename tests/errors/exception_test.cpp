// The exception classes: code text, Clone and Throw, application name, CExInfo, the communication table.
#include <ostrand/errors/Exception.h>
#include <gtest/gtest.h>
#include <tuple>
#include <typeinfo>

using namespace ostrand;

TEST(CStdExceptionTest, CodeTextCloneThrowAppNameCommTableAndCExInfo)
{
    const std::pair<DWORD, const wchar_t*> codes[] = {
        {0, L"0"}, {0x7FFFFFFF, L"2147483647"}, {0x80000000u, L"0x80000000"}, {0x800401F3u, L"0x800401F3"}};
    for (const auto& [code, text] : codes)
        EXPECT_EQ(ustring(text), CWinException(0, NULL, NULL, code).GetErrorCodeStr()) << code;
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
            const CStdException::CExInfo info(e);
            EXPECT_TRUE(typeid(*original) == typeid(e) && info.GetLine() == line &&
                        info.GetFileName() == file && info.GetFunction() == function &&
                        info.GetErrorCodeStr() == code && info.GetSource() == source);
        }
    }
    EXPECT_EQ(ustring(L"ostrand_errors_tests"), CStdException::GetAppName()); // the executable's name
    CStdException::SetAppName(L"Surveyor");
    EXPECT_EQ(ustring(L"Surveyor"), CStdException::GetAppName());
    CStdException::SetAppName(nullptr);
    EXPECT_EQ(ustring(L"ostrand_errors_tests"), CStdException::GetAppName());
    // Rows 1 and 37 (another shape); matching is case-sensitive on the whole text; unknown is its own text.
    // clang-format off
    const std::pair<const wchar_t*, const wchar_t*> texts[] = {
        {L"{2,,wrong command}", L"Wrong command"}, {L"{22,Unable to retrieve sourcetable}", L"Unable to retrieve sourcetable"},
        {L"{2,,Wrong command}", L"{2,,Wrong command}"}, {L"{2,,wrong command} ", L"{2,,wrong command} "}, {nullptr, L""}};
    // clang-format on
    ustring message(L"stale"); // each row overwrites the text of the row before
    for (const auto& [code, expected] : texts)
        EXPECT_TRUE(CCommException(0, NULL, NULL, code).GetErrorMessage(message) && message == expected)
            << code;
    const CCommException::INT2UI* table = CCommException::m_aINT2UI; // rows 1 and 37, and 16 equal to 33
    EXPECT_TRUE(ustring(table[0].pszErrorCode) == texts[0].first &&
                ustring(table[36].pszErrorCode) == texts[1].first &&
                ustring(table[15].pszErrorCode) == table[32].pszErrorCode &&
                ustring(table[15].pszMessage) == table[32].pszMessage);
    CStdException::CExInfo info(CCommException(9, L"Socket", L"Recv", L"{2,,can't lock}", NULL));
    info.SetAdditionalInfo(L"kept");
    EXPECT_EQ(ustring(L"Can't lock"), info.GetErrorMessage());
    info.Clear();
    EXPECT_TRUE(info.GetLine() == 0 && info.GetFileName().empty() && info.GetFunction().empty() &&
                info.GetErrorCodeStr().empty() && info.GetSource().empty() &&
                info.GetErrorMessage().empty() && info.GetAdditionalInfo() == L"kept");
}
