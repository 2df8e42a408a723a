// Microsoft's C runtime, which Wine has, and threads that Wine knows. The linker takes these before those of
// the shared libraries (-Bsymbolic).
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
