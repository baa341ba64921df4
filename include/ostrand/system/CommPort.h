// The library's serial (COM) port.
//
// Classes in this file: CCommPort.
//
// CCommPort is a CFile opened on a communication device, with one member per Win32 communication call
// and nothing beyond that call: the application owns the whole configuration sequence (SetupComm,
// SetCommState, SetCommTimeouts, SetCommMask) and the choice between synchronous and overlapped use.
// Reading, writing and collecting overlapped results are the inherited CFile::Read, CFile::Write and
// CFile::GetOverlappedResult.
//
// Failures: every failed call throws CWinException with GetLastError(), the call's name
// ("SetCommState", ...) and the file "CommPort". Opening is CFile::Open, so a port that cannot be opened
// throws "CreateFile" from the file "File", like any other file. WaitCommEvent, like Read and Write,
// reports an overlapped wait under way (ERROR_IO_PENDING) as false. No member tests whether the port is
// open: on a closed port the system's error is thrown under the member's call name.
//
// Threads: no locks. With FILE_FLAG_OVERLAPPED a read, a write and a WaitCommEvent may be outstanding at
// the same time, each with its own OVERLAPPED record.
#pragma once

#include <ostrand/platform.h>
#include <ostrand/system/File.h>

namespace ostrand
{

class OSTRAND_API CCommPort : public CFile
{
public:
    CCommPort();
    // Opens at once; see Open. On failure nothing is left open.
    CCommPort(const wchar_t* name, DWORD flags);

    using CFile::Open;
    // Opens `name` for reading and writing without sharing (OPEN_EXISTING) with the CreateFileW `flags`
    // (0 or FILE_FLAG_OVERLAPPED, usually), closing a port that was open before. `name` reaches the
    // system unchanged: ports above COM9 need the device form "\\.\COM10".
    virtual void Open(const wchar_t* name, DWORD flags);

    // Configuration
    void SetupComm(DWORD inQueue, DWORD outQueue);
    void GetCommState(DCB& dcb);
    void SetCommState(const DCB& dcb);
    void GetCommTimeouts(COMMTIMEOUTS& timeouts);
    void SetCommTimeouts(const COMMTIMEOUTS& timeouts);
    void GetCommProperties(COMMPROP& properties);
    void GetCommMask(DWORD& mask);
    void SetCommMask(DWORD mask);

    // Line state and control
    void GetCommModemStatus(DWORD& status);
    void ClearCommError(DWORD& errors, COMSTAT& status);
    // There is deliberately no member that sets a break.
    void ClearCommBreak();
    void EscapeCommFunction(DWORD function);
    void PurgeComm(DWORD flags);
    void TransmitCommChar(char c);

    // True when an event of the mask occurred (it is in `mask`); false when an overlapped wait is under
    // way: wait on the record's event, then collect it with GetOverlappedResult.
    bool WaitCommEvent(DWORD& mask, OVERLAPPED* overlapped = NULL);
};

} // namespace ostrand
