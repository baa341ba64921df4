// The one header that stands in front of <windows.h> for every Ostrand header and source.
//
// It fixes the Unicode build, the target Windows version and the include order of Winsock, and it
// removes the generic A/W macros whose names the library's own members use, so that a member such as
// `CreateEvent` means the same thing in every translation unit. Library code calls the W functions
// by their full names.
#pragma once

#ifndef UNICODE
#define UNICODE
#endif
#ifndef _UNICODE
#define _UNICODE
#endif
#ifndef WIN32_LEAN_AND_MEAN
#define WIN32_LEAN_AND_MEAN
#endif
#ifndef NOMINMAX
#define NOMINMAX
#endif
#ifndef _WIN32_WINNT
#define _WIN32_WINNT 0x0A00
#endif
#ifndef WINVER
#define WINVER _WIN32_WINNT
#endif

#include <winsock2.h>
#include <ws2tcpip.h>
#include <windows.h>

#undef CreateEvent
#undef CreateMutex
#undef CreateFile
#undef CreateWindow
#undef DeleteFile
#undef DrawText
#undef GetClassName
#undef GetMessage
#undef GetObject
#undef LoadIcon
#undef LoadImage
#undef LoadString
#undef PostMessage
#undef RegisterClass
#undef SendMessage
#undef Yield

#if defined(OSTRAND_STATIC)
#define OSTRAND_API
#elif defined(OSTRAND_BUILDING)
#define OSTRAND_API __declspec(dllexport)
#else
#define OSTRAND_API __declspec(dllimport)
#endif
