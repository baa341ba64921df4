#include <ostrand/platform.h>
#include <ostrand/system/CommPort.h>

#include "internal/throw.h"

namespace ostrand
{

CCommPort::CCommPort() {}

CCommPort::CCommPort(const wchar_t* name, DWORD flags)
    : CFile(name, GENERIC_READ | GENERIC_WRITE, 0, NULL, OPEN_EXISTING, flags, NULL, false)
{
}

void CCommPort::Open(const wchar_t* name, DWORD flags)
{
    CFile::Open(name, GENERIC_READ | GENERIC_WRITE, 0, NULL, OPEN_EXISTING, flags, NULL, false);
}

void CCommPort::SetupComm(DWORD inQueue, DWORD outQueue)
{
    OSTRAND_CHECK_BOOL(::SetupComm(GetHandle(), inQueue, outQueue), L"SetupComm");
}

void CCommPort::GetCommState(DCB& dcb)
{
    OSTRAND_CHECK_BOOL(::GetCommState(GetHandle(), &dcb), L"GetCommState");
}

void CCommPort::SetCommState(const DCB& dcb)
{
    DCB copy = dcb;
    OSTRAND_CHECK_BOOL(::SetCommState(GetHandle(), &copy), L"SetCommState");
}

void CCommPort::GetCommTimeouts(COMMTIMEOUTS& timeouts)
{
    OSTRAND_CHECK_BOOL(::GetCommTimeouts(GetHandle(), &timeouts), L"GetCommTimeouts");
}

void CCommPort::SetCommTimeouts(const COMMTIMEOUTS& timeouts)
{
    COMMTIMEOUTS copy = timeouts;
    OSTRAND_CHECK_BOOL(::SetCommTimeouts(GetHandle(), &copy), L"SetCommTimeouts");
}

void CCommPort::GetCommProperties(COMMPROP& properties)
{
    OSTRAND_CHECK_BOOL(::GetCommProperties(GetHandle(), &properties), L"GetCommProperties");
}

void CCommPort::GetCommMask(DWORD& mask)
{
    OSTRAND_CHECK_BOOL(::GetCommMask(GetHandle(), &mask), L"GetCommMask");
}

void CCommPort::SetCommMask(DWORD mask)
{
    OSTRAND_CHECK_BOOL(::SetCommMask(GetHandle(), mask), L"SetCommMask");
}

void CCommPort::GetCommModemStatus(DWORD& status)
{
    OSTRAND_CHECK_BOOL(::GetCommModemStatus(GetHandle(), &status), L"GetCommModemStatus");
}

void CCommPort::ClearCommError(DWORD& errors, COMSTAT& status)
{
    OSTRAND_CHECK_BOOL(::ClearCommError(GetHandle(), &errors, &status), L"ClearCommError");
}

void CCommPort::ClearCommBreak()
{
    OSTRAND_CHECK_BOOL(::ClearCommBreak(GetHandle()), L"ClearCommBreak");
}

void CCommPort::EscapeCommFunction(DWORD function)
{
    OSTRAND_CHECK_BOOL(::EscapeCommFunction(GetHandle(), function), L"EscapeCommFunction");
}

void CCommPort::PurgeComm(DWORD flags)
{
    OSTRAND_CHECK_BOOL(::PurgeComm(GetHandle(), flags), L"PurgeComm");
}

void CCommPort::TransmitCommChar(char c)
{
    OSTRAND_CHECK_BOOL(::TransmitCommChar(GetHandle(), c), L"TransmitCommChar");
}

bool CCommPort::WaitCommEvent(DWORD& mask, OVERLAPPED* overlapped)
{
    const BOOL done = ::WaitCommEvent(GetHandle(), &mask, overlapped);
    const DWORD error = done ? 0 : ::GetLastError();
    OSTRAND_RETURN_DONE_OR_NOT_YET(done, error, ERROR_IO_PENDING, L"WaitCommEvent");
}

} // namespace ostrand
