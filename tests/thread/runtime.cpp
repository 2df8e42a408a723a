// Microsoft's C runtime for the tests with several threads, as far as they come.
namespace {

// A text that a format of Microsoft's printf makes. The values stand one after the other, each in eight bytes.
template <typename Character>
std::basic_string<Character> Print(const Character* format, const char* arguments) {
  std::basic_string<Character> text;
  const auto take = [&arguments](auto& value) {
    std::memcpy(&value, arguments, sizeof(value));
    arguments += sizeof(int64_t);
  };
  // Linux's printf makes numbers, by the narrow format of one of them.
  const auto add = [&text](const std::string& one, auto value) {
    std::array<char, 64> digits{};
    const int count = std::snprintf(digits.data(), digits.size(), one.c_str(), value);
    text.append(digits.begin(), digits.begin() + count);
  };
  for (; *format; ++format) {
    if (*format != '%') {
      text += *format;
      continue;
    }
    std::string one = "%";
    bool is_long = false;  // has eight bytes; a long has four
    const Character* letter = format + 1;
    for (; std::string_view("0123456789.- +#l").find(static_cast<char>(*letter)) !=
           std::string_view::npos;
         ++letter) {
      if (*letter == 'l') is_long = letter[1] == 'l' || is_long;
      if (*letter != 'l') one += static_cast<char>(*letter);
    }
    format = letter;
    const char conversion = static_cast<char>(*letter);
    if (conversion == '%') {
      text += '%';
    } else if (conversion == 's') {
      const Character* value = nullptr;
      take(value);
      static constexpr Character kNull[] = {'(', 'n', 'u', 'l', 'l', ')', 0};
      text += value ? value : kNull;
    } else if (conversion == 'p') {
      uint64_t value = 0;
      take(value);
      add("%016llX", value);
    } else if (std::string_view("cdiuxX").find(conversion) != std::string_view::npos && !is_long) {
      int value = 0;
      take(value);
      add(one + conversion, value);
    } else {
      std::printf("not made here: %%%c\n", conversion);
      std::abort();
    }
  }
  return text;
}

template <typename Character>
int PrintTo(Character* text, size_t size, const Character* format, const char* arguments) {
  const std::basic_string<Character> made = Print(format, arguments);
  if (made.size() >= size) return -1;
  std::copy_n(made.c_str(), made.size() + 1, text);
  return static_cast<int>(made.size());
}

}  // namespace

int _vscprintf(const char* format, va_list arguments) {
  return static_cast<int>(Print(format, arguments).size());
}

int _vscwprintf(const wchar_t* format, va_list arguments) {
  return static_cast<int>(Print(format, arguments).size());
}

int vsprintf_s(char* text, size_t size, const char* format, va_list arguments) {
  return PrintTo(text, size, format, arguments);
}

int vswprintf_s(wchar_t* text, size_t size, const wchar_t* format, va_list arguments) {
  return PrintTo(text, size, format, arguments);
}

int _wtoi(const wchar_t* text) { return std::atoi(std::string(text, text + wcslen(text)).c_str()); }

double _wtof(const wchar_t* text) {
  return std::atof(std::string(text, text + wcslen(text)).c_str());
}

int64_t _mktime64(std::tm* local) { return std::mktime(local); }

int _localtime64_s(std::tm* local, const int64_t* seconds) {
  return localtime_r(seconds, local) ? 0 : EINVAL;
}
