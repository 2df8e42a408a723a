// The rest of Win32 that the tests with several threads need: locks, threads, time, texts.
#include <pthread.h>
#include <sched.h>
#include <unistd.h>

namespace {

thread_local DWORD last_error = ERROR_SUCCESS;

static_assert(sizeof(pthread_mutex_t) <= sizeof(CRITICAL_SECTION));
pthread_mutex_t* MutexOf(CRITICAL_SECTION* section) {
  return reinterpret_cast<pthread_mutex_t*>(section);
}

// All slim locks are this one.
std::mutex slim_lock;
std::condition_variable slim_changed;

// One character for each byte: the texts of these tests are ASCII.
template <typename From, typename To>
int Convert(const From* from, int length, To* to, int room) {
  const int count = length < 0 ? static_cast<int>(std::basic_string_view(from).size()) + 1 : length;
  if (room == 0) return count;
  if (room < count) {
    SetLastError(ERROR_INSUFFICIENT_BUFFER);
    return 0;
  }
  std::copy_n(from, count, to);
  return count;
}

}  // namespace

DWORD WINAPI GetLastError() { return last_error; }
void WINAPI SetLastError(DWORD error) { last_error = error; }

// --- Locks

BOOL WINAPI InitializeCriticalSectionAndSpinCount(CRITICAL_SECTION* section, DWORD) {
  pthread_mutexattr_t attributes;
  pthread_mutexattr_init(&attributes);
  pthread_mutexattr_settype(&attributes, PTHREAD_MUTEX_RECURSIVE);
  pthread_mutex_init(MutexOf(section), &attributes);
  pthread_mutexattr_destroy(&attributes);
  return TRUE;
}
void WINAPI DeleteCriticalSection(CRITICAL_SECTION* section) {
  pthread_mutex_destroy(MutexOf(section));
}
void WINAPI EnterCriticalSection(CRITICAL_SECTION* section) {
  pthread_mutex_lock(MutexOf(section));
}
void WINAPI LeaveCriticalSection(CRITICAL_SECTION* section) {
  pthread_mutex_unlock(MutexOf(section));
}

void WINAPI AcquireSRWLockExclusive(SRWLOCK*) { slim_lock.lock(); }
void WINAPI ReleaseSRWLockExclusive(SRWLOCK*) { slim_lock.unlock(); }
void WINAPI WakeAllConditionVariable(CONDITION_VARIABLE*) { slim_changed.notify_all(); }
BOOL WINAPI SleepConditionVariableSRW(CONDITION_VARIABLE*, SRWLOCK*, DWORD timeout_ms, ULONG) {
  std::unique_lock lock(slim_lock, std::adopt_lock);
  const auto end = slim_changed.wait_for(lock, std::chrono::milliseconds(timeout_ms));
  lock.release();
  return end == std::cv_status::no_timeout;
}

// --- Threads and time

DWORD WINAPI GetCurrentThreadId() { return static_cast<DWORD>(gettid()); }
DWORD WINAPI GetCurrentProcessId() { return static_cast<DWORD>(getpid()); }

DWORD WINAPI TlsAlloc() {
  pthread_key_t key = 0;
  pthread_key_create(&key, nullptr);
  return key;
}
BOOL WINAPI TlsFree(DWORD slot) { return pthread_key_delete(slot) == 0; }
void* WINAPI TlsGetValue(DWORD slot) { return pthread_getspecific(slot); }
BOOL WINAPI TlsSetValue(DWORD slot, void* value) { return pthread_setspecific(slot, value) == 0; }

DWORD WINAPI GetTickCount() {
  using std::chrono::milliseconds;
  return static_cast<DWORD>(std::chrono::steady_clock::now().time_since_epoch() / milliseconds(1));
}
void WINAPI Sleep(DWORD milliseconds) {
  std::this_thread::sleep_for(std::chrono::milliseconds(milliseconds));
}
BOOL WINAPI SwitchToThread() { return sched_yield() == 0; }

void WINAPI GetLocalTime(SYSTEMTIME* time) {
  const time_t now = std::time(nullptr);
  std::tm local{};
  localtime_r(&now, &local);
  *time = {};
  time->wHour = static_cast<WORD>(local.tm_hour);
  time->wMinute = static_cast<WORD>(local.tm_min);
  time->wSecond = static_cast<WORD>(local.tm_sec);
}

// --- Texts

int WINAPI MultiByteToWideChar(UINT, DWORD, const char* from, int length, wchar_t* to, int room) {
  return Convert(from, length, to, room);
}
int WINAPI WideCharToMultiByte(
    UINT, DWORD, const wchar_t* from, int length, char* to, int room, const char*, BOOL*) {
  return Convert(from, length, to, room);
}

// Nothing asks for its length.
BSTR WINAPI SysAllocString(const wchar_t* text) {
  if (!text) return nullptr;
  const size_t count = wcslen(text) + 1;
  auto* const copy = static_cast<wchar_t*>(std::malloc(count * sizeof(wchar_t)));
  return copy ? wmemcpy(copy, text, count) : nullptr;
}
void WINAPI SysFreeString(BSTR text) { std::free(text); }

HRESULT WINAPI VarBstrCmp(BSTR left, BSTR right, LCID, ULONG) {
  const int order = std::wstring_view(left ? left : L"").compare(right ? right : L"");
  if (order == 0) return VARCMP_EQ;
  return order < 0 ? VARCMP_LT : VARCMP_GT;
}

DWORD WINAPI GetTempPathW(DWORD, wchar_t* path) {
  constexpr std::wstring_view kFolder = L"/tmp/";
  path[kFolder.copy(path, kFolder.size())] = L'\0';
  return kFolder.size();
}
BOOL WINAPI DeleteFileW(const wchar_t* path) {
  return unlink(std::string(path, path + wcslen(path)).c_str()) == 0;
}

// The user has made no settings.
LSTATUS WINAPI RegOpenKeyExW(HKEY, const wchar_t*, DWORD, REGSAM, HKEY*) {
  return ERROR_FILE_NOT_FOUND;
}

// --- What is linked, but no test reaches

#define NOT_REACHED(name)                      \
  void NotReached_##name() asm(#name);         \
  void NotReached_##name() {                   \
    std::printf("not made here: " #name "\n"); \
    std::abort();                              \
  }

NOT_REACHED(CancelIo)
NOT_REACHED(CancelIoEx)
NOT_REACHED(ClearCommError)
NOT_REACHED(ConnectNamedPipe)
NOT_REACHED(CreateNamedPipeW)
NOT_REACHED(DeviceIoControl)
NOT_REACHED(FlsAlloc)
NOT_REACHED(FlsFree)
NOT_REACHED(GetCommState)
NOT_REACHED(GetOverlappedResult)
NOT_REACHED(GetProcessHeaps)
NOT_REACHED(HeapLock)
NOT_REACHED(HeapUnlock)
NOT_REACHED(HeapWalk)
NOT_REACHED(K32GetProcessMemoryInfo)
NOT_REACHED(PurgeComm)
NOT_REACHED(RaiseException)
NOT_REACHED(RegCloseKey)
NOT_REACHED(RegQueryValueExW)
NOT_REACHED(SetCommMask)
NOT_REACHED(SetCommState)
NOT_REACHED(SetCommTimeouts)
NOT_REACHED(SetupComm)
