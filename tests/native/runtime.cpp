// What Windows sources need and Linux's C and C++ libraries have otherwise: functions of a wchar_t of two
// bytes, Microsoft's printf, threads that Wine knows. The linker takes these before those of the shared
// libraries (-Bsymbolic).
namespace {

// A function of Wine's msvcrt.dll.
template <typename Function>
Function* Msvcrt(const char* name) {
  static const HMODULE library = LoadLibraryW(L"msvcrt.dll");
  return reinterpret_cast<Function*>(GetProcAddress(library, name));
}

}  // namespace

int _vscprintf(const char* format, va_list arguments) {
  static auto* const function = Msvcrt<int WINAPI(const char*, char*)>("_vscprintf");
  return function(format, arguments);
}

int _vscwprintf(const wchar_t* format, va_list arguments) {
  static auto* const function = Msvcrt<int WINAPI(const wchar_t*, char*)>("_vscwprintf");
  return function(format, arguments);
}

int vsprintf_s(char* text, size_t size, const char* format, va_list arguments) {
  static auto* const function = Msvcrt<int WINAPI(char*, size_t, const char*, char*)>("vsprintf_s");
  return function(text, size, format, arguments);
}

int vswprintf_s(wchar_t* text, size_t size, const wchar_t* format, va_list arguments) {
  static auto* const function =
      Msvcrt<int WINAPI(wchar_t*, size_t, const wchar_t*, char*)>("vswprintf_s");
  return function(text, size, format, arguments);
}

int sprintf_s(char* text, size_t size, const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  const int length = vsprintf_s(text, size, format, arguments);
  va_end(arguments);
  return length;
}

int _wtoi(const wchar_t* text) {
  static auto* const function = Msvcrt<int WINAPI(const wchar_t*)>("_wtoi");
  return function(text);
}

double _wtof(const wchar_t* text) {
  static auto* const function = Msvcrt<double WINAPI(const wchar_t*)>("_wtof");
  return function(text);
}

int _putenv(const char* text) {
  static auto* const function = Msvcrt<int WINAPI(const char*)>("_putenv");
  return function(text);
}

void _tzset() {
  static auto* const function = Msvcrt<void WINAPI()>("_tzset");
  function();
}

// Microsoft's tm is the beginning of Linux's.
int64_t _mktime64(std::tm* local) {
  static auto* const function = Msvcrt<int64_t WINAPI(std::tm*)>("_mktime64");
  return function(local);
}

int _localtime64_s(std::tm* local, const int64_t* seconds) {
  static auto* const function = Msvcrt<int WINAPI(std::tm*, const int64_t*)>("_localtime64_s");
  return function(local, seconds);
}

// std::wstring calls these.
extern "C" {

size_t wcslen(const wchar_t* text) {
  const wchar_t* end = text;
  while (*end) ++end;
  return static_cast<size_t>(end - text);
}

int wcscmp(const wchar_t* left, const wchar_t* right) {
  for (; *left && *left == *right; ++left) ++right;
  return *left - *right;
}

wchar_t* wmemchr(const wchar_t* text, wchar_t wanted, size_t count) {
  const wchar_t* const end = text + count;
  const wchar_t* const found = std::find(text, end, wanted);
  return found == end ? nullptr : const_cast<wchar_t*>(found);
}

int wmemcmp(const wchar_t* left, const wchar_t* right, size_t count) {
  for (; count > 0; --count, ++left, ++right) {
    if (*left != *right) return *left < *right ? -1 : 1;
  }
  return 0;
}

wchar_t* wmemcpy(wchar_t* to, const wchar_t* from, size_t count) {
  return static_cast<wchar_t*>(std::memcpy(to, from, count * sizeof(wchar_t)));
}

wchar_t* wmemmove(wchar_t* to, const wchar_t* from, size_t count) {
  return static_cast<wchar_t*>(std::memmove(to, from, count * sizeof(wchar_t)));
}

wchar_t* wmemset(wchar_t* text, wchar_t value, size_t count) {
  std::fill_n(text, count, value);
  return text;
}

// std::to_wstring calls it.
int vswprintf(wchar_t* text, size_t size, const wchar_t* format, __builtin_va_list arguments) {
  return vswprintf_s(text, size, format, MicrosoftArguments<wchar_t>(format, arguments).data());
}

}  // extern "C"

// A thread that Wine has not made cannot call Wine's functions.
namespace {

DWORD WINAPI RunThread(void* parameter) {
  const std::unique_ptr<std::thread::_State> state(static_cast<std::thread::_State*>(parameter));
  state->_M_run();
  return 0;
}

}  // namespace

void std::thread::_M_start_thread(_State_ptr state, void (*)()) {
  const HANDLE thread = CreateThread(nullptr, 0, RunThread, state.release(), 0, nullptr);
  _M_id = id(reinterpret_cast<native_handle_type>(thread));
}

void std::thread::join() {
  WaitForSingleObject(reinterpret_cast<HANDLE>(native_handle()), INFINITE);
  CloseHandle(reinterpret_cast<HANDLE>(native_handle()));
  _M_id = id();
}

void std::thread::detach() {
  CloseHandle(reinterpret_cast<HANDLE>(native_handle()));
  _M_id = id();
}
