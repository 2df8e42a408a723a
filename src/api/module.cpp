// The module's start and end.
#include <array>
#include <cstddef>
#include <vector>

#include "api/exception_state.h"
#include "api/file_lists.h"
#include "api/registry.h"
#include "platform/hresult.h"
#include "platform/win32.h"
#include "report/report_file.h"

namespace {

// Writes the load line with the module's path and product version; nothing when a step fails. No
// report can be open this early, so the line never shows: hosts open one through the loaded
// library.
void TraceModule(HMODULE module) {
  std::array<wchar_t, MAX_PATH> path{};
  if (GetModuleFileNameW(module, path.data(), MAX_PATH) == 0) return;
  DWORD ignored = 0;
  const DWORD size = GetFileVersionInfoSizeW(path.data(), &ignored);
  if (size == 0) return;
  std::vector<std::byte> block(size);
  if (!GetFileVersionInfoW(path.data(), 0, size, block.data())) return;
  VS_FIXEDFILEINFO* version = nullptr;
  UINT version_size = 0;
  if (!VerQueryValueW(block.data(), L"\\", reinterpret_cast<void**>(&version), &version_size)) {
    return;
  }
  Trace(L"Module is loaded [%s] [%u.%u.%u.%u]\r\n",
        path.data(),
        HIWORD(version->dwProductVersionMS),
        LOWORD(version->dwProductVersionMS),
        HIWORD(version->dwProductVersionLS),
        LOWORD(version->dwProductVersionLS));
}

void Start(HMODULE module) {
  PrepareReport();
  Receivers();
  OpenLists();
  TraceModule(module);
}

// What the host has not closed goes after the farewell, while the report still takes its lines.
void End() {
  Trace(L"Bye!\r\n");
  OpenLists().Clear();
  Receivers().Clear();
}

}  // namespace

extern "C" BOOL WINAPI DllMain(HINSTANCE module, DWORD reason, void* process_ends) {
  if (reason == DLL_PROCESS_ATTACH) {
    Start(module);
  } else if (reason == DLL_PROCESS_DETACH) {
    // A line that cannot be written does not keep the rest from being freed.
    CatchResult([] {
      End();
      return S_OK;
    });
    // The end of a process frees everything. It has stopped the other threads wherever they were,
    // in the middle of an allocation too, so the less is done the better.
    if (!process_ends) FreeExceptionState();
  }
  return TRUE;
}
