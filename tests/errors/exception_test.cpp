// The exception classes: payload, code text, cloning and re-throwing by dynamic type, the application
// name, CExInfo, and the messages of Win32 and instrument errors.
#include <ostrand/errors/Exception.h>

#include <gtest/gtest.h>

#include <typeinfo>

using namespace ostrand;

TEST(CWinExceptionTest, DefaultAndPayload)
{
    const CWinException empty;
    EXPECT_EQ(0u, empty.GetLine());
    EXPECT_TRUE(empty.GetFileName().empty());
    EXPECT_TRUE(empty.GetFunction().empty());
    EXPECT_EQ(0u, empty.GetErrorCode());
    EXPECT_EQ(ustring(L"0"), empty.GetErrorCodeStr());

    const CWinException e(42, L"File", L"CreateFile", ERROR_FILE_NOT_FOUND);
    EXPECT_EQ(42u, e.GetLine());
    EXPECT_EQ(ustring(L"File"), e.GetFileName());
    EXPECT_EQ(ustring(L"CreateFile"), e.GetFunction());
    EXPECT_EQ(static_cast<DWORD>(ERROR_FILE_NOT_FOUND), e.GetErrorCode());
}

TEST(CWinExceptionTest, ErrorCodeTextIsDecimalOrHexForTheTopBit)
{
    const struct
    {
        DWORD code;
        const wchar_t* text;
    } rows[] = {{0, L"0"},
                {2, L"2"},
                {5, L"5"},
                {0x7FFFFFFF, L"2147483647"},
                {0x80000000u, L"0x80000000"},
                {0x80004005u, L"0x80004005"},
                {0x800401F3u, L"0x800401F3"},
                {0xFFFFFFFFu, L"0xFFFFFFFF"}};
    for (const auto& r : rows)
        EXPECT_EQ(ustring(r.text), CWinException(0, NULL, NULL, r.code).GetErrorCodeStr()) << r.code;
}

TEST(CWinExceptionTest, SourceIsTheLibraryResourceText)
{
    ustring source;
    EXPECT_TRUE(CWinException().GetSource(source));
    EXPECT_EQ(ustring(L"Win32"), source);
}

TEST(CWinExceptionTest, MessageIsTheSystemTextOrTheUnknownErrorText)
{
    // Wine's texts differ from Windows', so the expected text is what the system says in this process.
    wchar_t* system = NULL;
    const DWORD n = ::FormatMessageW(FORMAT_MESSAGE_ALLOCATE_BUFFER | FORMAT_MESSAGE_IGNORE_INSERTS |
                                         FORMAT_MESSAGE_FROM_SYSTEM,
                                     NULL, ERROR_FILE_NOT_FOUND, MAKELANGID(LANG_NEUTRAL, SUBLANG_DEFAULT),
                                     reinterpret_cast<wchar_t*>(&system), 0, NULL);
    ASSERT_NE(0u, n);
    const ustring expected(system, n);
    ::LocalFree(system);
    ustring message;
    EXPECT_TRUE(CWinException(0, NULL, NULL, ERROR_FILE_NOT_FOUND).GetErrorMessage(message));
    EXPECT_EQ(expected, message);

    EXPECT_FALSE(CWinException(0, NULL, NULL, 0x2000ABCD).GetErrorMessage(message));
    EXPECT_EQ(ustring(L"Unknown error: 536914893 (0x2000ABCD)."), message);
    EXPECT_FALSE(CWinException(0, NULL, NULL, 0xE0001234u).GetErrorMessage(message));
    EXPECT_EQ(ustring(L"Unknown error: -536866252 (0xE0001234)."), message);
}

TEST(CStdExceptionTest, CloneAndThrowKeepTheDynamicType)
{
    const CWinException win(42, L"File", L"CreateFile", ERROR_FILE_NOT_FOUND);
    const CCommException comm(7, L"CommPort", L"Read", L"{2,,dup loop}", L"Receiver");
    const CStdException* const originals[] = {&win, &comm};
    for (const CStdException* original : originals)
    {
        boost::shared_ptr<const CStdException> copy = original->Clone();
        ASSERT_TRUE(copy);
        EXPECT_NE(original, copy.get());
        EXPECT_EQ(typeid(*original), typeid(*copy));
        EXPECT_EQ(original->GetLine(), copy->GetLine());
        EXPECT_EQ(original->GetErrorCodeStr(), copy->GetErrorCodeStr());
        bool caughtAsDerived = false;
        try
        {
            copy->Throw();
        }
        catch (const CWinException& e)
        {
            caughtAsDerived = original == &win;
            EXPECT_EQ(static_cast<DWORD>(ERROR_FILE_NOT_FOUND), e.GetErrorCode());
            EXPECT_EQ(ustring(L"CreateFile"), e.GetFunction());
        }
        catch (const CCommException& e)
        {
            caughtAsDerived = original == &comm;
            EXPECT_EQ(ustring(L"{2,,dup loop}"), e.GetErrorCodeStr());
            EXPECT_EQ(ustring(L"CommPort"), e.GetFileName());
        }
        EXPECT_TRUE(caughtAsDerived);
        EXPECT_THROW(copy->Throw(), CStdException);
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

TEST(CExInfoTest, DescribesAndClears)
{
    CStdException::CExInfo info(CCommException(9, L"Socket", L"Recv", L"{2,,can't lock}", NULL));
    EXPECT_EQ(9u, info.GetLine());
    EXPECT_EQ(ustring(L"Socket"), info.GetFileName());
    EXPECT_EQ(ustring(L"Recv"), info.GetFunction());
    EXPECT_EQ(ustring(L"{2,,can't lock}"), info.GetErrorCodeStr());
    EXPECT_TRUE(info.GetSource().empty());
    EXPECT_EQ(ustring(L"Can't lock"), info.GetErrorMessage());

    const CStdException::CExInfo win(CWinException(3, L"File", L"ReadFile", 0x2000ABCD));
    EXPECT_EQ(ustring(L"536914893"), win.GetErrorCodeStr());
    EXPECT_EQ(ustring(L"Win32"), win.GetSource());
    EXPECT_EQ(ustring(L"Unknown error: 536914893 (0x2000ABCD)."), win.GetErrorMessage());

    info.SetAdditionalInfo(L"kept");
    CStdException::CExInfo copy(info);
    copy.Clear();
    EXPECT_EQ(0u, copy.GetLine());
    EXPECT_TRUE(copy.GetFileName().empty() && copy.GetFunction().empty() && copy.GetErrorCodeStr().empty() &&
                copy.GetSource().empty() && copy.GetErrorMessage().empty());
    EXPECT_EQ(ustring(L"kept"), copy.GetAdditionalInfo());
    CStdException::CExInfo moved(std::move(info));
    EXPECT_EQ(ustring(L"kept"), moved.GetAdditionalInfo());
    EXPECT_EQ(ustring(L"Can't lock"), moved.GetErrorMessage());
    CStdException::CExInfo assigned;
    assigned = moved;
    EXPECT_EQ(ustring(L"kept"), assigned.GetAdditionalInfo());
    EXPECT_EQ(9u, assigned.GetLine());
}

TEST(CCommExceptionTest, EveryTableRowGivesItsMessage)
{
    // A copy of the table as instruments and users know it; the library's own copy must agree row by row.
    const wchar_t* const rows[37][2] = {
        {L"{2,,wrong command}", L"Wrong command"},
        {L"{2,,1st parameter missed}", L"1st parameter missed"},
        {L"{2,,wrong 1st parameter}", L"Wrong 1st parameter"},
        {L"{2,,2nd parameter missed}", L"2nd parameter missed"},
        {L"{2,,wrong 2nd parameter}", L"Wrong 2nd parameter"},
        {L"{2,,value missed}", L"Value missed"},
        {L"{2,,value out of range}", L"Value out of range"},
        {L"{2,,wrong file name}", L"Wrong file name"},
        {L"{2,,file open error}", L"File open error"},
        {L"{2,,file system not mounted}", L"File system not mounted"},
        {L"{2,,file read error}", L"File read error"},
        {L"{2,,file already exists}", L"File already exists"},
        {L"{2,,can't create file}", L"Can't create file"},
        {L"{2,,can't remove file}", L"Can't remove file"},
        {L"{2,,broken file}", L"Broken file"},
        {L"{2,,incompatible file version}", L"Incompatible file version"},
        {L"{2,,file write error}", L"File write error"},
        {L"{2,,data transfer open}", L"Data transfer open"},
        {L"{2,,data transfer error}", L"Data transfer error"},
        {L"{2,,wrong option name}", L"Wrong option name"},
        {L"{2,,bad option date}", L"Bad option date"},
        {L"{2,,bad option value}", L"Bad option value"},
        {L"{2,,option disabled}", L"Option disabled"},
        {L"{2,,terminated by user}", L"Terminated by user"},
        {L"{2,,wrong receiver id}", L"Wrong receiver id"},
        {L"{2,,access denied}", L"Access denied"},
        {L"{2,,operation in progress}", L"Operation in progress"},
        {L"{2,,no file system device}", L"No file system device"},
        {L"{2,,dup loop}", L"Dup loop"},
        {L"{2,,not supported}", L"Not supported"},
        {L"{2,,device is not accessible}", L"Device is not accessible"},
        {L"{2,,wrong hardware version}", L"Wrong hardware version"},
        {L"{2,,incompatible file version}", L"Incompatible file version"},
        {L"{2,,can't lock}", L"Can't lock"},
        {L"{2,,memory card is busy}", L"Memory card is busy"},
        {L"{2,,data transfer delay}", L"Data transfer delay"},
        {L"{22,Unable to retrieve sourcetable}", L"Unable to retrieve sourcetable"},
    };
    for (size_t i = 0; i < 37; ++i)
    {
        SCOPED_TRACE(testing::Message() << "row " << i + 1);
        EXPECT_EQ(ustring(rows[i][0]), ustring(CCommException::m_aINT2UI[i].pszErrorCode));
        EXPECT_EQ(ustring(rows[i][1]), ustring(CCommException::m_aINT2UI[i].pszMessage));
        ustring message;
        EXPECT_TRUE(CCommException(0, NULL, NULL, rows[i][0]).GetErrorMessage(message));
        EXPECT_EQ(ustring(rows[i][1]), message);
    }
}

TEST(CCommExceptionTest, UnknownTextIsItsOwnMessage)
{
    struct
    {
        const wchar_t* code;
        const wchar_t* message;
    } const rows[] = {
        {L"{22,Unable to retrieve sourcetable}", L"Unable to retrieve sourcetable"},
        {L"{2,,Wrong command}", L"{2,,Wrong command}"}, // case matters
        {L"{2,,wrong command} ", L"{2,,wrong command} "},
        {L"{2,,wrong", L"{2,,wrong"},
        {L"", L""},
        {NULL, L""},
    };
    for (const auto& r : rows)
    {
        const CCommException e(0, NULL, NULL, r.code, L"Receiver");
        ustring message(L"stale"), source;
        EXPECT_TRUE(e.GetErrorMessage(message));
        EXPECT_EQ(ustring(r.message), message);
        EXPECT_TRUE(e.GetSource(source));
        EXPECT_EQ(ustring(L"Receiver"), source);
    }
}
