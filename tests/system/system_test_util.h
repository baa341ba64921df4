// The check of a thrown CWinException, shared by the system tests.
#pragma once

#include <ostrand/errors/Exception.h>

#include <gtest/gtest.h>

// Expects `f` to throw a CWinException that carries this error, call and file name.
template <class F> void ExpectWin(F f, DWORD code, const wchar_t* call, const wchar_t* file)
{
    try
    {
        f();
        ADD_FAILURE() << "no CWinException was thrown";
    }
    catch (const ostrand::CWinException& e)
    {
        EXPECT_EQ(code, e.GetErrorCode());
        EXPECT_EQ(ostrand::ustring(call), e.GetFunction());
        EXPECT_EQ(ostrand::ustring(file), e.GetFileName());
        EXPECT_GT(e.GetLine(), 0u);
    }
}
