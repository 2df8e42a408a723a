// Win32's events, mutexes and files, their handles, and waits for them.
//
// ThreadSanitizer sees of them what Win32 promises: what a thread did before it ended a wait comes
// before the end of that wait. It does not see the lock in here, which would order all threads.
#include <fcntl.h>
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

struct Object {
  enum class Kind { kEvent, kMutex, kFile };
  Kind kind;
  bool is_manual = false;     // an event: a wait does not clear it
  bool is_signalled = false;  // an event
  pid_t holder = 0;           // the thread that holds a mutex
  int times = 0;              // how often it took it
  bool is_abandoned = false;  // the thread that held it has ended
  int file = -1;
};

std::mutex lock;
std::condition_variable changed;
std::deque<Object> objects;  // they stay: a wait may go on when the handle was closed
std::array<Object*, 4096> handles{};

// Holds the lock, unseen by the sanitizer.
class Scope {
 public:
  Scope() {
    AnnotateIgnoreSyncBegin(__FILE__, __LINE__);
    AnnotateIgnoreReadsBegin(__FILE__, __LINE__);
    AnnotateIgnoreWritesBegin(__FILE__, __LINE__);
    held_.lock();
  }
  Scope(const Scope&) = delete;
  Scope& operator=(const Scope&) = delete;
  ~Scope() {
    held_.unlock();
    AnnotateIgnoreWritesEnd(__FILE__, __LINE__);
    AnnotateIgnoreReadsEnd(__FILE__, __LINE__);
    AnnotateIgnoreSyncEnd(__FILE__, __LINE__);
  }
  std::unique_lock<std::mutex>& held() { return held_; }

 private:
  std::unique_lock<std::mutex> held_{lock, std::defer_lock};
};

// Handles are multiples of four, and the lowest free one is given out first.
constexpr uintptr_t kStep = 4;

// The place of a handle in the table; null for one that is not open.
Object** Place(HANDLE handle) {
  const uintptr_t value = reinterpret_cast<uintptr_t>(handle);
  const bool is_handle = value != 0 && value % kStep == 0 && value / kStep <= handles.size();
  Object** const place = is_handle ? &handles.at(value / kStep - 1) : nullptr;
  if (place && *place) return place;
  SetLastError(ERROR_INVALID_HANDLE);
  return nullptr;
}

HANDLE NewHandle(Object* object) {
  const auto free = std::ranges::find(handles, nullptr);
  *free = object;
  return reinterpret_cast<HANDLE>((static_cast<uintptr_t>(free - handles.begin()) + 1) * kStep);
}

HANDLE Create(const Object& object) {
  const Scope scope;
  return NewHandle(&objects.emplace_back(object));
}

Object* Find(HANDLE handle) {
  const Scope scope;
  Object** const place = Place(handle);
  return place ? *place : nullptr;
}

// A change that may end waits.
template <typename Function>
void Change(Object* object, Function function) {
  __tsan_release(object);
  const Scope scope;
  function();
  changed.notify_all();
}

// The mutexes that a thread holds. When it ends, others can take them.
struct HeldMutexes {
  ~HeldMutexes() {
    for (Object* const mutex : mutexes) {
      Change(mutex, [mutex] {
        mutex->holder = 0;
        mutex->times = 0;
        mutex->is_abandoned = true;
      });
    }
  }
  std::vector<Object*> mutexes;
};
thread_local HeldMutexes held;

// Whether a wait for the object ends now. A wait takes a mutex, and clears an event.
bool Take(Object& object) {
  if (object.kind == Object::Kind::kMutex) {
    if (object.holder != 0 && object.holder != gettid()) return false;
    object.holder = gettid();
    if (object.times++ == 0) held.mutexes.push_back(&object);
    return true;
  }
  return object.is_manual ? object.is_signalled : std::exchange(object.is_signalled, false);
}

// Waits until one of the objects can be taken.
DWORD Wait(std::span<const HANDLE> wanted, DWORD timeout_ms) {
  std::vector<Object*> found;
  for (const HANDLE handle : wanted) found.push_back(Find(handle));
  if (std::ranges::count(found, nullptr) != 0) return WAIT_FAILED;
  auto taken = found.end();
  bool is_abandoned = false;
  {
    Scope scope;
    const auto take = [&] {
      taken = std::ranges::find_if(found, [](Object* object) { return Take(*object); });
      return taken != found.end();
    };
    const std::chrono::milliseconds timeout(timeout_ms);
    if (timeout_ms == INFINITE) changed.wait(scope.held(), take);
    if (timeout_ms != INFINITE && !changed.wait_for(scope.held(), timeout, take)) {
      return WAIT_TIMEOUT;
    }
    is_abandoned = std::exchange((*taken)->is_abandoned, false);
  }
  __tsan_acquire(*taken);
  const auto number = static_cast<DWORD>(taken - found.begin());
  return is_abandoned ? WAIT_ABANDONED_0 + number : WAIT_OBJECT_0 + number;
}

// What read and write give: a number of bytes, or less than 0.
BOOL Count(ssize_t length, DWORD* count) {
  *count = static_cast<DWORD>(std::max<ssize_t>(length, 0));
  return length >= 0;
}

}  // namespace

HANDLE WINAPI CreateEventW(SECURITY_ATTRIBUTES*, BOOL manual, BOOL signalled, const wchar_t*) {
  return Create({.kind = Object::Kind::kEvent,
                 .is_manual = manual != FALSE,
                 .is_signalled = signalled != FALSE});
}

BOOL WINAPI SetEvent(HANDLE event) {
  Object* const object = Find(event);
  if (object) Change(object, [object] { object->is_signalled = true; });
  return object != nullptr;
}

BOOL WINAPI ResetEvent(HANDLE event) {
  Object* const object = Find(event);
  const Scope scope;
  if (object) object->is_signalled = false;
  return object != nullptr;
}

HANDLE WINAPI CreateMutexW(SECURITY_ATTRIBUTES*, BOOL, const wchar_t*) {
  return Create({.kind = Object::Kind::kMutex});
}

BOOL WINAPI ReleaseMutex(HANDLE mutex) {
  Object* const object = Find(mutex);
  if (!object) return FALSE;
  if (std::ranges::count(held.mutexes, object) == 0) {
    SetLastError(ERROR_NOT_OWNER);
    return FALSE;
  }
  Change(object, [object] {
    if (--object->times != 0) return;
    object->holder = 0;
    std::erase(held.mutexes, object);
  });
  return TRUE;
}

DWORD WINAPI WaitForSingleObject(HANDLE handle, DWORD timeout_ms) {
  return Wait({&handle, 1}, timeout_ms);
}

DWORD WINAPI WaitForMultipleObjects(DWORD count, const HANDLE* wanted, BOOL, DWORD timeout_ms) {
  return Wait({wanted, count}, timeout_ms);
}

HANDLE WINAPI GetCurrentProcess() { return INVALID_HANDLE_VALUE; }

BOOL WINAPI DuplicateHandle(HANDLE, HANDLE handle, HANDLE, HANDLE* copy, DWORD, BOOL, DWORD) {
  const Scope scope;
  Object** const place = Place(handle);
  if (place) *copy = NewHandle(*place);
  return place != nullptr;
}

BOOL WINAPI CloseHandle(HANDLE handle) {
  const Scope scope;
  Object** const place = Place(handle);
  if (!place) return FALSE;
  if (const Object* const object = std::exchange(*place, nullptr); object->file >= 0) {
    close(object->file);
  }
  return TRUE;
}

BOOL WINAPI GetHandleInformation(HANDLE handle, DWORD*) { return Find(handle) != nullptr; }

// A report, or the device NUL.
HANDLE WINAPI CreateFileW(const wchar_t* path,
                          DWORD access,
                          DWORD,
                          SECURITY_ATTRIBUTES*,
                          DWORD disposition,
                          DWORD,
                          HANDLE) {
  const std::wstring_view name(path);
  const std::string linux_name =
      name == L"NUL" ? "/dev/null" : std::string(name.begin(), name.end());
  const int mode = (access & GENERIC_WRITE ? O_RDWR : O_RDONLY) |
                   (disposition == CREATE_ALWAYS ? O_CREAT | O_TRUNC : 0);
  const int file = open(linux_name.c_str(), mode, S_IRUSR | S_IWUSR);
  if (file >= 0) return Create({.kind = Object::Kind::kFile, .file = file});
  SetLastError(ERROR_FILE_NOT_FOUND);
  return INVALID_HANDLE_VALUE;
}

BOOL WINAPI ReadFile(HANDLE handle, void* bytes, DWORD size, DWORD* count, OVERLAPPED*) {
  return Count(read(Find(handle)->file, bytes, size), count);
}

BOOL WINAPI WriteFile(HANDLE handle, const void* bytes, DWORD size, DWORD* count, OVERLAPPED*) {
  return Count(write(Find(handle)->file, bytes, size), count);
}

DWORD WINAPI GetFileSize(HANDLE handle, DWORD*) {
  struct stat status {};
  fstat(Find(handle)->file, &status);
  return static_cast<DWORD>(status.st_size);
}
