// The arguments of a Microsoft printf. In its ABI a va_list is a pointer to values of eight bytes.
#ifndef RCVLINK_TESTS_NATIVE_MICROSOFT_ARGUMENTS_H_
#define RCVLINK_TESTS_NATIVE_MICROSOFT_ARGUMENTS_H_

#include <array>
#include <bit>
#include <cstdarg>
#include <cstddef>
#include <cstdint>

// Those of a Linux va_list, as the format says.
template <typename Character>
class MicrosoftArguments {
 public:
  MicrosoftArguments(const Character* format, __builtin_va_list arguments) {
    __builtin_va_list rest;
    va_copy(rest, arguments);
    for (; format && *format; ++format) {
      if (*format == '%') format = Take(format + 1, rest);
      if (!*format) break;
    }
    va_end(rest);
  }

  char* data() { return reinterpret_cast<char*>(values_.data()); }

 private:
  // Takes the arguments of one conversion; gives the conversion's letter.
  const Character* Take(const Character* format, __builtin_va_list& rest) {
    bool is_long = false;
    for (; *format; ++format) {
      switch (*format) {
        case '*':
          Add(va_arg(rest, int));
          break;
        case 'l':  // a long has four bytes there
          is_long = is_long || format[1] == 'l';
          break;
        case 'I':
          is_long = format[1] == '6';
          break;
        case 'd':
        case 'i':
        case 'u':
        case 'x':
        case 'X':
        case 'o':
        case 'c':
        case 'C':
          if (is_long) Add(va_arg(rest, int64_t));
          if (!is_long) Add(va_arg(rest, int));
          return format;
        case 's':
        case 'S':
        case 'p':
        case 'n':
          Add(reinterpret_cast<intptr_t>(va_arg(rest, void*)));
          return format;
        case 'e':
        case 'E':
        case 'f':
        case 'g':
        case 'G':
        case 'a':
        case 'A':
          Add(std::bit_cast<int64_t>(va_arg(rest, double)));
          return format;
        case '%':
          return format;
        default:
          break;  // flags, width, precision, h
      }
    }
    return format;
  }

  void Add(int64_t value) {
    if (count_ < values_.size()) values_[count_++] = value;
  }

  std::array<int64_t, 64> values_{};  // an allocation would disturb the tests that count them
  size_t count_ = 0;
};

#endif  // RCVLINK_TESTS_NATIVE_MICROSOFT_ARGUMENTS_H_
