// Runs a fuzz target on a thread of Wine's, as the sanitizer needs it.
#include "tests/fuzz/target.h"

extern "C" int LLVMFuzzerRunDriver(int* argc,
                                   char*** argv,
                                   int (*target)(const uint8_t* data, size_t size));

namespace {

struct Arguments {
  int count;
  char** values;
};

int RunTarget(const uint8_t* data, size_t size) {
  fuzz::Target({data, size});
  return 0;
}

DWORD WINAPI Run(void* parameter) {
  auto* const arguments = static_cast<Arguments*>(parameter);
  std::_Exit(LLVMFuzzerRunDriver(&arguments->count, &arguments->values, RunTarget));
}

}  // namespace

int main(int argc, char** argv) {
  Arguments arguments{argc, argv};
  constexpr SIZE_T kStackSize = 8 * 1024 * 1024;
  WaitForSingleObject(CreateThread(nullptr, kStackSize, Run, &arguments, 0, nullptr), INFINITE);
  return 1;
}
