// Parts of the C++ runtime that would be a third of the DLL and never serve it. The linker takes the
// definitions below instead of libstdc++'s.
//
// Only the DLL needs this source: the size of a program does not matter as much.
#include <cstdlib>
#include <exception>
#include <new>

// libstdc++'s own would print the name of the exception, for which it has a demangler and a printf. A
// DLL has no console.
void __gnu_cxx::__verbose_terminate_handler() { std::abort(); }

// What the standard library raises for a mistake of its caller. libstdc++'s own bring in strings of
// its former ABI and random devices. The library gives E_OUTOFMEMORY for a bad_alloc and E_UNEXPECTED
// for any other exception (CatchResult), so the types need not be finer. If the linker finds one of
// these defined twice, the library has begun to use another function of the same source: add it here.
namespace std {

// The names are the standard library's, and it has declared them.
// NOLINTBEGIN(bugprone-reserved-identifier,readability-redundant-declaration)

void __throw_bad_alloc() { throw std::bad_alloc(); }
void __throw_bad_array_new_length() { throw std::bad_alloc(); }
void __throw_bad_function_call() { throw std::exception(); }
void __throw_length_error(const char*) { throw std::exception(); }
void __throw_logic_error(const char*) { throw std::exception(); }
void __throw_out_of_range_fmt(const char*, ...) { throw std::exception(); }

// NOLINTEND(bugprone-reserved-identifier,readability-redundant-declaration)

}  // namespace std
