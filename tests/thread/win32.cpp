// Win32 for the tests with several threads, as far as they come. ThreadSanitizer sees of it what Win32 promises: a
// wait that has ended comes after the call that has ended it. Its own lock orders nothing.
#include <fcntl.h>
#include <pthread.h>
#include <sanitizer/tsan_interface.h>
#include <sys/stat.h>
#include <unistd.h>

extern "C" {
void AnnotateIgnoreSyncBegin(const char* file, int line);
void AnnotateIgnoreSyncEnd(const char* file, int line);
void AnnotateIgnoreReadsBegin(const char* file, int line);
void AnnotateIgnoreReadsEnd(const char* file, int line);
void AnnotateIgnoreWritesBegin(const char* file, int line);
void AnnotateIgnoreWritesEnd(const char* file, int line);
}

namespace {

thread_local DWORD last_error = ERROR_SUCCESS;

BOOL Fail(DWORD error) {
  last_error = error;
  return FALSE;
}

// --- Objects and their handles

// An event, a mutex or a file.
struct Object {
  enum class Kind { kEvent, kMutex, kFile };
  Kind kind;
  bool is_manual = false;     // an event: a wait does not clear it
  bool is_signalled = false;  // an event
  pid_t holder = 0;           // of a mutex
  int times = 0;              // it holds it
  bool is_abandoned = false;  // the holder has ended
  int file = -1;
};

struct Kernel {
  std::mutex lock;
  std::condition_variable changed;
  std::deque<Object> objects;  // they stay: a wait may be for one whose handle was closed
  std::array<Object*, 4096> handles{};
};

Kernel& TheKernel() {
  static Kernel kernel;
  return kernel;
}

// Holds the lock of the objects, unseen by the sanitizer.
class KernelScope {
 public:
  KernelScope() {
    AnnotateIgnoreSyncBegin(__FILE__, __LINE__);
    AnnotateIgnoreReadsBegin(__FILE__, __LINE__);
    AnnotateIgnoreWritesBegin(__FILE__, __LINE__);
    lock_ = std::unique_lock(TheKernel().lock);
  }
  KernelScope(const KernelScope&) = delete;
  KernelScope& operator=(const KernelScope&) = delete;
  ~KernelScope() {
    lock_.unlock();
    AnnotateIgnoreWritesEnd(__FILE__, __LINE__);
    AnnotateIgnoreReadsEnd(__FILE__, __LINE__);
    AnnotateIgnoreSyncEnd(__FILE__, __LINE__);
  }

  std::unique_lock<std::mutex>& lock() { return lock_; }

 private:
  std::unique_lock<std::mutex> lock_;
};

// The place of a handle in the table. Handles are multiples of four; the lowest free one is given out first.
constexpr uintptr_t kStep = 4;

Object** Place(HANDLE handle) {
  const uintptr_t value = reinterpret_cast<uintptr_t>(handle);
  auto& handles = TheKernel().handles;
  if (value % kStep != 0 || value == 0 || value / kStep > handles.size()) return nullptr;
  Object** const place = &handles.at(value / kStep - 1);
  return *place ? place : nullptr;
}

HANDLE NewHandle(Object* object) {
  auto& handles = TheKernel().handles;
  const auto free = std::ranges::find(handles, nullptr);
  *free = object;
  return reinterpret_cast<HANDLE>((static_cast<uintptr_t>(free - handles.begin()) + 1) * kStep);
}

HANDLE Create(const Object& object) {
  const KernelScope scope;
  return NewHandle(&TheKernel().objects.emplace_back(object));
}

Object* Find(HANDLE handle) {
  const KernelScope scope;
  Object** const place = Place(handle);
  if (!place) last_error = ERROR_INVALID_HANDLE;
  return place ? *place : nullptr;
}

// What the threads that wait see; what this thread did before comes before the end of their waits.
template <typename Function>
void Change(Object* object, Function function) {
  __tsan_release(object);
  const KernelScope scope;
  function();
  TheKernel().changed.notify_all();
}

// The mutexes that a thread holds. When it ends, they are free for others.
class HeldMutexes {
 public:
  ~HeldMutexes() {
    for (Object* const mutex : mutexes_) {
      Change(mutex, [mutex] {
        mutex->holder = 0;
        mutex->is_abandoned = true;
      });
    }
  }
  void Add(Object* mutex) { mutexes_.push_back(mutex); }
  void Remove(Object* mutex) { std::erase(mutexes_, mutex); }

 private:
  std::vector<Object*> mutexes_;
};

thread_local HeldMutexes held_mutexes;

// Whether a wait for the object ends now; it takes the object then.
bool Take(Object& object) {
  if (object.kind == Object::Kind::kMutex) {
    if (object.holder != 0 && object.holder != gettid()) return false;
    object.holder = gettid();
    if (object.times++ == 0) held_mutexes.Add(&object);
    return true;
  }
  const bool is_signalled = object.is_signalled;
  if (!object.is_manual) object.is_signalled = false;
  return is_signalled;
}

// Waits until one of the objects can be taken, and gives its number.
DWORD Wait(std::span<const HANDLE> handles, DWORD timeout_ms) {
  std::vector<Object*> objects;
  for (const HANDLE handle : handles) {
    Object* const object = Find(handle);
    if (!object) return WAIT_FAILED;
    objects.push_back(object);
  }
  auto taken = objects.end();
  bool is_abandoned = false;
  {
    KernelScope scope;
    const auto take = [&] {
      taken = std::ranges::find_if(objects, [](Object* object) { return Take(*object); });
      return taken != objects.end();
    };
    auto& changed = TheKernel().changed;
    if (timeout_ms == INFINITE) changed.wait(scope.lock(), take);
    if (timeout_ms != INFINITE)
      changed.wait_for(scope.lock(), std::chrono::milliseconds(timeout_ms), take);
    if (taken == objects.end()) return WAIT_TIMEOUT;
    is_abandoned = std::exchange((*taken)->is_abandoned, false);
  }
  __tsan_acquire(*taken);
  return (is_abandoned ? WAIT_ABANDONED_0 : WAIT_OBJECT_0) +
         static_cast<DWORD>(taken - objects.begin());
}

std::string Narrow(const wchar_t* text) { return std::string(text, text + wcslen(text)); }

// As many characters as fit, one byte for each; the texts of these tests are ASCII.
template <typename From, typename To>
int Convert(const From* from, int length, To* to, int room) {
  if (!from) return Fail(ERROR_INVALID_PARAMETER);
  const int count = length < 0 ? static_cast<int>(std::basic_string_view(from).size()) + 1 : length;
  if (room == 0) return count;
  if (room < count) return Fail(ERROR_INSUFFICIENT_BUFFER);
  std::copy_n(from, count, to);
  return count;
}

// The one lock that all slim locks share.
std::mutex slim_lock;
std::condition_variable slim_changed;

}  // namespace

DWORD WINAPI GetLastError() { return last_error; }
void WINAPI SetLastError(DWORD error) { last_error = error; }

HANDLE WINAPI CreateEventW(SECURITY_ATTRIBUTES*,
                           BOOL is_manual,
                           BOOL is_signalled,
                           const wchar_t*) {
  return Create({.kind = Object::Kind::kEvent,
                 .is_manual = is_manual != 0,
                 .is_signalled = is_signalled != 0});
}

HANDLE WINAPI CreateMutexW(SECURITY_ATTRIBUTES*, BOOL, const wchar_t*) {
  return Create({.kind = Object::Kind::kMutex});
}

BOOL WINAPI SetEvent(HANDLE event) {
  Object* const object = Find(event);
  if (object) Change(object, [object] { object->is_signalled = true; });
  return object != nullptr;
}

BOOL WINAPI ResetEvent(HANDLE event) {
  Object* const object = Find(event);
  if (object) Change(object, [object] { object->is_signalled = false; });
  return object != nullptr;
}

BOOL WINAPI ReleaseMutex(HANDLE mutex) {
  Object* const object = Find(mutex);
  if (!object) return FALSE;
  const auto is_mine = [object] {
    const KernelScope scope;
    return object->holder == gettid();
  };
  if (!is_mine()) return Fail(ERROR_NOT_OWNER);
  Change(object, [object] {
    if (--object->times != 0) return;
    object->holder = 0;
    held_mutexes.Remove(object);
  });
  return TRUE;
}

DWORD WINAPI WaitForSingleObject(HANDLE handle, DWORD timeout_ms) {
  return Wait({&handle, 1}, timeout_ms);
}

DWORD WINAPI WaitForMultipleObjects(DWORD count, const HANDLE* handles, BOOL, DWORD timeout_ms) {
  return Wait({handles, count}, timeout_ms);
}

BOOL WINAPI DuplicateHandle(HANDLE, HANDLE handle, HANDLE, HANDLE* copy, DWORD, BOOL, DWORD) {
  const KernelScope scope;
  Object** const place = Place(handle);
  if (!place) return Fail(ERROR_INVALID_HANDLE);
  *copy = NewHandle(*place);
  return TRUE;
}

BOOL WINAPI CloseHandle(HANDLE handle) {
  const KernelScope scope;
  Object** const place = Place(handle);
  if (!place) return Fail(ERROR_INVALID_HANDLE);
  if ((*place)->kind == Object::Kind::kFile) close((*place)->file);
  *place = nullptr;
  return TRUE;
}

BOOL WINAPI GetHandleInformation(HANDLE handle, DWORD*) { return Find(handle) != nullptr; }

HANDLE WINAPI GetCurrentProcess() { return INVALID_HANDLE_VALUE; }

// --- Locks

static_assert(sizeof(pthread_mutex_t) <= sizeof(CRITICAL_SECTION));

namespace {
pthread_mutex_t* MutexOf(CRITICAL_SECTION* section) {
  return reinterpret_cast<pthread_mutex_t*>(section);
}
}  // namespace

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
  const bool in_time = slim_changed.wait_for(lock, std::chrono::milliseconds(timeout_ms)) ==
                       std::cv_status::no_timeout;
  lock.release();
  return in_time;
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
  return static_cast<DWORD>(std::chrono::steady_clock::now().time_since_epoch() /
                            std::chrono::milliseconds(1));
}
void WINAPI Sleep(DWORD milliseconds) {
  std::this_thread::sleep_for(std::chrono::milliseconds(milliseconds));
}

void WINAPI GetLocalTime(SYSTEMTIME* time) {
  const auto now = std::chrono::system_clock::now();
  const time_t seconds = std::chrono::system_clock::to_time_t(now);
  std::tm local{};
  localtime_r(&seconds, &local);
  *time = {};
  time->wHour = static_cast<WORD>(local.tm_hour);
  time->wMinute = static_cast<WORD>(local.tm_min);
  time->wSecond = static_cast<WORD>(local.tm_sec);
  time->wMilliseconds =
      static_cast<WORD>(now.time_since_epoch() / std::chrono::milliseconds(1) % 1000);
}

// --- Files: the device NUL and reports

DWORD WINAPI GetTempPathW(DWORD, wchar_t* path) {
  constexpr std::wstring_view kFolder = L"/tmp/";
  path[kFolder.copy(path, kFolder.size())] = L'\0';
  return kFolder.size();
}

HANDLE WINAPI CreateFileW(const wchar_t* path,
                          DWORD access,
                          DWORD,
                          SECURITY_ATTRIBUTES*,
                          DWORD disposition,
                          DWORD,
                          HANDLE) {
  const std::string name = path == std::wstring_view(L"NUL") ? "/dev/null" : Narrow(path);
  const int creates = disposition == CREATE_ALWAYS ? O_CREAT | O_TRUNC : 0;
  const int file =
      open(name.c_str(), (access & GENERIC_WRITE ? O_RDWR : O_RDONLY) | creates, S_IRUSR | S_IWUSR);
  if (file >= 0) return Create({.kind = Object::Kind::kFile, .file = file});
  last_error = ERROR_FILE_NOT_FOUND;
  return INVALID_HANDLE_VALUE;
}

BOOL WINAPI ReadFile(HANDLE handle, void* bytes, DWORD size, DWORD* count, OVERLAPPED*) {
  const Object* const object = Find(handle);
  const ssize_t length = object ? read(object->file, bytes, size) : -1;
  *count = static_cast<DWORD>(std::max<ssize_t>(length, 0));
  return length >= 0;
}

BOOL WINAPI WriteFile(HANDLE handle, const void* bytes, DWORD size, DWORD* count, OVERLAPPED*) {
  const Object* const object = Find(handle);
  const ssize_t length = object ? write(object->file, bytes, size) : -1;
  *count = static_cast<DWORD>(std::max<ssize_t>(length, 0));
  return length >= 0;
}

DWORD WINAPI GetFileSize(HANDLE handle, DWORD*) {
  struct stat status {};
  fstat(Find(handle)->file, &status);
  return static_cast<DWORD>(status.st_size);
}

BOOL WINAPI DeleteFileW(const wchar_t* path) { return unlink(Narrow(path).c_str()) == 0; }

// --- Texts

int WINAPI MultiByteToWideChar(UINT, DWORD, const char* from, int length, wchar_t* to, int room) {
  return Convert(from, length, to, room);
}

int WINAPI WideCharToMultiByte(
    UINT, DWORD, const wchar_t* from, int length, char* to, int room, const char*, BOOL*) {
  return Convert(from, length, to, room);
}

BSTR WINAPI SysAllocString(const wchar_t* text) {
  if (!text) return nullptr;
  const size_t count = wcslen(text) + 1;
  auto* const copy = static_cast<wchar_t*>(std::malloc(count * sizeof(wchar_t)));
  return copy ? wmemcpy(copy, text, count) : nullptr;
}
void WINAPI SysFreeString(BSTR text) { std::free(text); }

HRESULT WINAPI VarBstrCmp(BSTR left, BSTR right, LCID, ULONG) {
  const int order = std::wstring_view(left ? left : L"").compare(right ? right : L"");
  return order == 0 ? VARCMP_EQ : order < 0 ? VARCMP_LT : VARCMP_GT;
}

// --- The user has no settings

LSTATUS WINAPI RegOpenKeyExW(HKEY, const wchar_t*, DWORD, REGSAM, HKEY*) {
  return ERROR_FILE_NOT_FOUND;
}

// --- What no test reaches

#define NOT_REACHED(name)                      \
  void NotReached_##name() asm(#name);         \
  void NotReached_##name() {                   \
    std::printf("not made here: %s\n", #name); \
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
