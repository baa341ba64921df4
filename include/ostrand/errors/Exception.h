// The exception classes that every part of the library throws.
//
// Classes in this file: CStdException (abstract root) with its record CExInfo, CWinException (a Win32
// error code), CCommException (an instrument's error reply, carried as text).
//
// Every wrapper of a Win32 call throws CWinException by value with the source line, the base name of
// the implementing source file ("File", "CommPort", ...), the name of the failed call ("CreateFile")
// and the code. Catch CStdException& and keep a copy with Clone(); Throw() raises the copy again with
// its own dynamic type, on any thread.
//
// Exceptions and CExInfo records are immutable values without locks and may be handed between
// threads. SetAppName/GetAppName are not synchronised: set the name before threads report errors.
#pragma once

#include <ostrand/platform.h>
#include <ostrand/text/ustring.h>

#include <boost/shared_ptr.hpp>

namespace ostrand
{

class OSTRAND_API CStdException
{
public:
    // A description of an exception detached from it: kept, passed between threads, shown later.
    class OSTRAND_API CExInfo
    {
    public:
        CExInfo() : m_nLine(0) {}
        explicit CExInfo(const CStdException& e);

        // Empties line, file name, function, error code, source and message. The additional
        // information is the application's and stays.
        void Clear();

        ustring GetFileName() const { return m_strFileName; }
        ustring GetFunction() const { return m_strFunction; }
        ustring GetErrorCodeStr() const { return m_strErrorCodeStr; }
        ustring GetSource() const { return m_strSource; }
        ustring GetErrorMessage() const { return m_strErrorMessage; }
        unsigned int GetLine() const { return m_nLine; }

        // A free text that travels with the record. The library never fills or reads it.
        ustring GetAdditionalInfo() const { return m_strAdditionalInfo; }
        void SetAdditionalInfo(const ustring& text) { m_strAdditionalInfo = text; }

    private:
        unsigned int m_nLine;
        ustring m_strFileName;
        ustring m_strFunction;
        ustring m_strErrorCodeStr;
        ustring m_strSource;
        ustring m_strErrorMessage;
        ustring m_strAdditionalInfo;
    };

    CStdException(unsigned int line = 0, const wchar_t* fileName = NULL, const wchar_t* function = NULL);
    virtual ~CStdException();

    virtual ustring GetErrorCodeStr() const = 0;
    // A heap copy of the exact dynamic type.
    virtual boost::shared_ptr<const CStdException> Clone() const = 0;
    // Throws a copy of *this typed as its dynamic class.
    virtual void Throw() const = 0;
    virtual bool GetSource(ustring& source) const = 0;
    // The readable message; true when a specific text was found.
    virtual bool GetErrorMessage(ustring& message) const = 0;

    ustring GetFileName() const { return m_strFileName; }
    ustring GetFunction() const { return m_strFunction; }
    unsigned int GetLine() const { return m_nLine; }

    // The application name of the reports: the one set, else the executable's base name ("tool" for
    // C:\bin\tool.exe), else empty.
    static ustring GetAppName();
    // A null name clears it.
    static void SetAppName(const wchar_t* name);

private:
    unsigned int m_nLine;
    ustring m_strFileName;
    ustring m_strFunction;

    static ustring m_strAppName;
};

// A failed Win32 call: GetLastError(), WSAGetLastError() or an HRESULT.
class OSTRAND_API CWinException : public CStdException
{
public:
    CWinException(unsigned int line = 0, const wchar_t* fileName = NULL, const wchar_t* function = NULL,
                  DWORD errorCode = 0);

    DWORD GetErrorCode() const { return m_dwErrorCode; }

    // Decimal, or "0x" and eight upper-case hex digits when the top bit is set.
    ustring GetErrorCodeStr() const override;
    boost::shared_ptr<const CStdException> Clone() const override;
    void Throw() const override;
    // "Win32", translated.
    bool GetSource(ustring& source) const override;
    // The system's message text, else the entry of DATA\Win32Errors.txt beside the library; otherwise
    // "Unknown error: <decimal> (0x<hex>)." and false.
    bool GetErrorMessage(ustring& message) const override;

private:
    // Looks `code` up in the supplementary message file, read afresh on every call. False when the
    // file is missing, unreadable, not UTF-16 with a byte-order mark or has no entry for the code.
    static bool FindSupplementaryMessage(DWORD code, ustring& message);

    DWORD m_dwErrorCode;
};

// An error reported by an instrument, carried as the text of its reply ("{2,,wrong command}").
class OSTRAND_API CCommException : public CStdException
{
public:
    // One row of the table that maps an instrument's error reply to a readable message.
    struct INT2UI
    {
        const wchar_t* pszErrorCode;
        const wchar_t* pszMessage;
    };

    CCommException(unsigned int line = 0, const wchar_t* fileName = NULL, const wchar_t* function = NULL,
                   const wchar_t* errorCode = NULL, const wchar_t* source = NULL);

    ustring GetErrorCodeStr() const override { return m_strErrorCode; }
    boost::shared_ptr<const CStdException> Clone() const override;
    void Throw() const override;
    bool GetSource(ustring& source) const override;
    // The readable message of a known reply (case-sensitive, whole text), else the reply itself.
    // Always true.
    bool GetErrorMessage(ustring& message) const override;

    static const INT2UI m_aINT2UI[37];

private:
    ustring m_strErrorCode;
    ustring m_strSource;
};

} // namespace ostrand
