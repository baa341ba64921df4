#include <ostrand/errors/Exception.h>

#include "internal/module.h"
#include "internal/resource_ids.h"
#include "internal/throw.h"

namespace ostrand
{

ustring CStdException::m_strAppName;

namespace detail
{
void ThrowWinException(unsigned int line, const wchar_t* file, const wchar_t* call, DWORD code)
{
    throw CWinException(line, file, call, code);
}
} // namespace detail

// CStdException ----------------------------------------------------------------------------------------

CStdException::CStdException(unsigned int line, const wchar_t* fileName, const wchar_t* function)
    : m_nLine(line), m_strFileName(fileName), m_strFunction(function)
{
}

CStdException::~CStdException() {}

ustring CStdException::GetAppName()
{
    if (!m_strAppName.empty())
        return m_strAppName;
    const ustring path = detail::ModuleFileName(NULL);
    return path.empty() ? ustring() : detail::BaseNameWithoutExtension(path);
}

void CStdException::SetAppName(const wchar_t* name)
{
    m_strAppName = name;
}

CStdException::CExInfo::CExInfo(const CStdException& e)
    : m_nLine(e.GetLine()), m_strFileName(e.GetFileName()), m_strFunction(e.GetFunction()),
      m_strErrorCodeStr(e.GetErrorCodeStr())
{
    e.GetSource(m_strSource);
    e.GetErrorMessage(m_strErrorMessage);
}

void CStdException::CExInfo::Clear()
{
    m_nLine = 0;
    m_strFileName.clear();
    m_strFunction.clear();
    m_strErrorCodeStr.clear();
    m_strSource.clear();
    m_strErrorMessage.clear();
}

// CWinException ----------------------------------------------------------------------------------------

CWinException::CWinException(unsigned int line, const wchar_t* fileName, const wchar_t* function,
                             DWORD errorCode)
    : CStdException(line, fileName, function), m_dwErrorCode(errorCode)
{
}

ustring CWinException::GetErrorCodeStr() const
{
    ustring text;
    if (static_cast<LONG>(m_dwErrorCode) < 0)
        text.sprintf(L"0x%X", m_dwErrorCode);
    else
        text.sprintf(L"%d", m_dwErrorCode);
    return text;
}

boost::shared_ptr<const CStdException> CWinException::Clone() const
{
    return boost::shared_ptr<const CStdException>(new CWinException(*this));
}

void CWinException::Throw() const
{
    throw CWinException(*this);
}

bool CWinException::GetSource(ustring& source) const
{
    return source.xload(detail::LibraryModule(), IDS_SOURCE_WIN32);
}

bool CWinException::GetErrorMessage(ustring& message) const
{
    wchar_t* text = NULL;
    const DWORD n = ::FormatMessageW(
        FORMAT_MESSAGE_ALLOCATE_BUFFER | FORMAT_MESSAGE_IGNORE_INSERTS | FORMAT_MESSAGE_FROM_SYSTEM, NULL,
        m_dwErrorCode, MAKELANGID(LANG_NEUTRAL, SUBLANG_DEFAULT), reinterpret_cast<wchar_t*>(&text), 0, NULL);
    if (n != 0 && text != NULL)
    {
        message.assign(text, n);
        ::LocalFree(text);
        return true;
    }
    if (text != NULL)
        ::LocalFree(text);
    if (FindSupplementaryMessage(m_dwErrorCode, message))
        return true;
    message.sprintf(L"Unknown error: %d (0x%X).", m_dwErrorCode, m_dwErrorCode);
    return false;
}

// CCommException ---------------------------------------------------------------------------------------

// Instrument error replies and their readable messages. The first equal row wins; the texts are compared
// whole and case-sensitively, their braces and digits mean nothing here.
const CCommException::INT2UI CCommException::m_aINT2UI[37] = {
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

CCommException::CCommException(unsigned int line, const wchar_t* fileName, const wchar_t* function,
                               const wchar_t* errorCode, const wchar_t* source)
    : CStdException(line, fileName, function), m_strErrorCode(errorCode), m_strSource(source)
{
}

boost::shared_ptr<const CStdException> CCommException::Clone() const
{
    return boost::shared_ptr<const CStdException>(new CCommException(*this));
}

void CCommException::Throw() const
{
    throw CCommException(*this);
}

bool CCommException::GetSource(ustring& source) const
{
    source = m_strSource;
    return true;
}

bool CCommException::GetErrorMessage(ustring& message) const
{
    for (const INT2UI& row : m_aINT2UI)
    {
        if (m_strErrorCode.compare(ustring(row.pszErrorCode), ustring::npos) == 0)
        {
            message = row.pszMessage;
            return true;
        }
    }
    message = m_strErrorCode;
    return true;
}

} // namespace ostrand
