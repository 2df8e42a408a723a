// Functions of text that Linux's C library has otherwise: there a wchar_t has four bytes, here two.

int sprintf_s(char* text, size_t size, const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  const int length = vsprintf_s(text, size, format, arguments);
  va_end(arguments);
  return length;
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
