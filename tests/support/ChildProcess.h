// A child process of a test: Start quotes the arguments into a command line and starts the program,
// Wait waits for its end, and the destructor terminates a child still running. Wine starts a Unix
// program (python3) this way too but gives it no pipes and no process handle: such a child ends by itself.
#pragma once

#include <ostrand/platform.h>

#include <initializer_list>
#include <memory>
#include <string>

namespace testsupport
{

class ChildProcess
{
public:
    // No argument may hold a '"' or end in '\'. False, with GetLastError set, when CreateProcessW fails.
    bool Start(std::initializer_list<std::wstring> arguments)
    {
        std::wstring command;
        for (const std::wstring& argument : arguments)
            command += (command.empty() ? L"\"" : L" \"") + argument + L"\"";
        STARTUPINFOW startup = {};
        startup.cb = sizeof(startup);
        PROCESS_INFORMATION process = {};
        if (!::CreateProcessW(NULL, &command[0], NULL, NULL, FALSE, 0, NULL, NULL, &startup, &process))
            return false;
        ::CloseHandle(process.hThread);
        m_process.reset(process.hProcess);
        return true;
    }

    // True when the child has ended within `milliseconds`, or when there is no handle to wait on.
    bool Wait(DWORD milliseconds) const
    {
        return !m_process || ::WaitForSingleObject(m_process.get(), milliseconds) == WAIT_OBJECT_0;
    }

private:
    struct Terminate
    {
        void operator()(HANDLE process) const
        {
            ::TerminateProcess(process, 1); // fails harmlessly once the child has ended
            ::CloseHandle(process);
        }
    };
    std::unique_ptr<void, Terminate> m_process;
};

} // namespace testsupport
