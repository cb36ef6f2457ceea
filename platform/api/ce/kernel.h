// Handles, threads, synchronisation, time, processes and debug output.
#pragma once

#include "ce/types.h"

inline constexpr DWORD WAIT_OBJECT_0 = 0;
inline constexpr DWORD WAIT_ABANDONED_0 = 0x80;
inline constexpr DWORD WAIT_TIMEOUT = 258;
inline constexpr DWORD WAIT_FAILED = 0xFFFFFFFFU;
inline constexpr DWORD MAXIMUM_WAIT_OBJECTS = 64;
inline constexpr DWORD STILL_ACTIVE = 0x103;
inline constexpr DWORD CREATE_SUSPENDED = 4;
inline constexpr DWORD EVENT_ALL_ACCESS = 0x1F0003;
inline constexpr DWORD EVENT_PULSE = 1;
inline constexpr DWORD EVENT_RESET = 2;
inline constexpr DWORD EVENT_SET = 3;

/// Room for the platform's own critical section; its content is the platform's business.
struct CRITICAL_SECTION {
  DWORD LockCount;
  HANDLE OwnerThread;
  HANDLE hCrit;
  DWORD needtrap;
  DWORD dwContentions;
};
using LPCRITICAL_SECTION = CRITICAL_SECTION*;

using LPTHREAD_START_ROUTINE = DWORD(WINAPI*)(void*);

inline constexpr DWORD TH32CS_SNAPPROCESS = 2;
inline constexpr DWORD TH32CS_SNAPNOHEAPS = 0x40000000U;

struct PROCESSENTRY32 {
  DWORD dwSize;
  DWORD cntUsage;
  DWORD th32ProcessID;
  DWORD th32DefaultHeapID;
  DWORD th32ModuleID;
  DWORD cntThreads;
  DWORD th32ParentProcessID;
  LONG pcPriClassBase;
  DWORD dwFlags;
  WCHAR szExeFile[MAX_PATH];
  DWORD th32MemoryBase;
  DWORD th32AccessKey;
};
using LPPROCESSENTRY32 = PROCESSENTRY32*;
static_assert(sizeof(PROCESSENTRY32) == 564, "the device's layout");

/// Why a library's entry point is called: it has been loaded, or is about to be unloaded.
inline constexpr DWORD DLL_PROCESS_DETACH = 0;
inline constexpr DWORD DLL_PROCESS_ATTACH = 1;

/// A function of a loaded library, to be cast to what it is.
using FARPROC = std::intptr_t(WINAPI*)();

struct PROCESS_INFORMATION {
  HANDLE hProcess;
  HANDLE hThread;
  DWORD dwProcessId;
  DWORD dwThreadId;
};

/// How a program's first window should appear. The device takes the record and looks at none of it.
struct STARTUPINFOW {
  DWORD cb;
  WCHAR* lpReserved;
  WCHAR* lpDesktop;
  WCHAR* lpTitle;
  DWORD dwX;
  DWORD dwY;
  DWORD dwXSize;
  DWORD dwYSize;
  DWORD dwXCountChars;
  DWORD dwYCountChars;
  DWORD dwFillAttribute;
  DWORD dwFlags;
  WORD wShowWindow;
  WORD cbReserved2;
  BYTE* lpReserved2;
  HANDLE hStdInput;
  HANDLE hStdOutput;
  HANDLE hStdError;
};

inline constexpr DWORD PROCESS_TERMINATE = 1;
inline constexpr DWORD PROCESS_ALL_ACCESS = 0x1F0FFF;

extern "C" {
HANDLE CreateThread(SECURITY_ATTRIBUTES* security, DWORD stack_size, LPTHREAD_START_ROUTINE start,
                    void* argument, DWORD flags, DWORD* thread_id);
BOOL TerminateThread(HANDLE thread, DWORD exit_code);
DWORD ResumeThread(HANDLE thread);
BOOL GetExitCodeThread(HANDLE thread, DWORD* exit_code);
DWORD GetCurrentThreadId();
DWORD GetCurrentProcessId();

HANDLE CreateEventW(SECURITY_ATTRIBUTES* security, BOOL manual_reset, BOOL initial_state,
                    const WCHAR* name);
HANDLE OpenEventW(DWORD access, BOOL inherit, const WCHAR* name);
BOOL SetEvent(HANDLE event);
BOOL ResetEvent(HANDLE event);
BOOL PulseEvent(HANDLE event);
/// The one function behind the three above that the device's library has; those stand in its
/// headers.
BOOL EventModify(HANDLE event, DWORD action);
HANDLE CreateMutexW(SECURITY_ATTRIBUTES* security, BOOL initial_owner, const WCHAR* name);
BOOL ReleaseMutex(HANDLE mutex);
HANDLE CreateSemaphoreW(SECURITY_ATTRIBUTES* security, LONG initial, LONG maximum,
                        const WCHAR* name);
BOOL ReleaseSemaphore(HANDLE semaphore, LONG count, LONG* previous);
void InitializeCriticalSection(CRITICAL_SECTION* section);
void EnterCriticalSection(CRITICAL_SECTION* section);
BOOL TryEnterCriticalSection(CRITICAL_SECTION* section);
void LeaveCriticalSection(CRITICAL_SECTION* section);
void DeleteCriticalSection(CRITICAL_SECTION* section);
DWORD WaitForSingleObject(HANDLE object, DWORD timeout_ms);
DWORD WaitForMultipleObjects(DWORD count, const HANDLE* objects, BOOL wait_all, DWORD timeout_ms);
BOOL CloseHandle(HANDLE object);

/// Puts `value` into `target` and returns what was there, as one step for all threads.
LONG InterlockedExchange(LONG volatile* target, LONG value);

void Sleep(DWORD duration_ms);
DWORD GetTickCount();
DWORD GetLastError();
void SetLastError(DWORD error);

HANDLE CreateToolhelp32Snapshot(DWORD flags, DWORD process_id);
BOOL CloseToolhelp32Snapshot(HANDLE snapshot);
BOOL Process32First(HANDLE snapshot, PROCESSENTRY32* entry);
BOOL Process32Next(HANDLE snapshot, PROCESSENTRY32* entry);
BOOL CreateProcessW(const WCHAR* program, WCHAR* command_line, SECURITY_ATTRIBUTES* process,
                    SECURITY_ATTRIBUTES* thread, BOOL inherit, DWORD flags, void* environment,
                    const WCHAR* folder, STARTUPINFOW* startup, PROCESS_INFORMATION* information);
HANDLE OpenProcess(DWORD access, BOOL inherit, DWORD process_id);
BOOL TerminateProcess(HANDLE process, DWORD exit_code);
BOOL GetExitCodeProcess(HANDLE process, DWORD* exit_code);

HMODULE LoadLibraryW(const WCHAR* name);
BOOL FreeLibrary(HMODULE module);
FARPROC GetProcAddressW(HMODULE module, const WCHAR* name);

void OutputDebugStringW(const WCHAR* text);
void NKDbgPrintfW(const WCHAR* format, ...);
}
