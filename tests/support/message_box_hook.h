// Windows only: makes the message boxes a loaded DLL shows readable by a test.
// ReportMessageBoxes(module) redirects the module's imported MessageBoxA
// (its import address table entry) to a function that writes
//   <caption>: <text>
// to stderr, as the POSIX build writes its fatal messages, and then calls the
// real MessageBoxA. An owner other than null or a style other than 0x2010
// (task-modal, error icon, OK) is reported on a line of its own first, so that
// it shows in a test that compares the first line.
#pragma once

#if defined(_WIN32)
#include <windows.h>

#include <cstdio>
#include <cstring>

namespace qdmtest {

using MessageBoxFn = int(WINAPI*)(HWND, LPCSTR, LPCSTR, UINT);

inline MessageBoxFn& RealMessageBox() {
  static MessageBoxFn real = nullptr;
  return real;
}

inline int WINAPI ReportingMessageBox(HWND owner, LPCSTR text, LPCSTR caption, UINT style) {
  if (owner != nullptr || style != 0x2010)
    std::fprintf(stderr, "MessageBoxA owner %p style 0x%x\n", static_cast<void*>(owner), style);
  std::fprintf(stderr, "%s: %s\n", caption, text);
  std::fflush(stderr);
  return RealMessageBox() ? RealMessageBox()(owner, text, caption, style) : IDOK;
}

// The import address table slot through which `module` calls dll!function, or
// null when the module does not import it by name.
inline ULONG_PTR* ImportSlot(HMODULE module, const char* dll, const char* function) {
  auto* base = reinterpret_cast<unsigned char*>(module);
  const auto* dos = reinterpret_cast<const IMAGE_DOS_HEADER*>(base);
  const auto* nt = reinterpret_cast<const IMAGE_NT_HEADERS*>(base + dos->e_lfanew);
  const IMAGE_DATA_DIRECTORY& imports =
      nt->OptionalHeader.DataDirectory[IMAGE_DIRECTORY_ENTRY_IMPORT];
  if (imports.VirtualAddress == 0) return nullptr;
  for (auto* entry = reinterpret_cast<IMAGE_IMPORT_DESCRIPTOR*>(base + imports.VirtualAddress);
       entry->Name != 0; ++entry) {
    if (_stricmp(reinterpret_cast<const char*>(base + entry->Name), dll) != 0) continue;
    auto* names = reinterpret_cast<IMAGE_THUNK_DATA*>(base + entry->OriginalFirstThunk);
    auto* slots = reinterpret_cast<IMAGE_THUNK_DATA*>(base + entry->FirstThunk);
    for (; names->u1.AddressOfData != 0; ++names, ++slots) {
      if (IMAGE_SNAP_BY_ORDINAL(names->u1.Ordinal)) continue;
      const auto* byName = reinterpret_cast<const IMAGE_IMPORT_BY_NAME*>(base + names->u1.AddressOfData);
      if (std::strcmp(reinterpret_cast<const char*>(byName->Name), function) == 0)
        return &slots->u1.Function;
    }
  }
  return nullptr;
}

// Returns false when the module does not import MessageBoxA from user32.
inline bool ReportMessageBoxes(void* module) {
  ULONG_PTR* slot = ImportSlot(static_cast<HMODULE>(module), "user32.dll", "MessageBoxA");
  if (slot == nullptr) return false;
  DWORD protection = 0;
  if (!VirtualProtect(slot, sizeof *slot, PAGE_READWRITE, &protection)) return false;
  RealMessageBox() = reinterpret_cast<MessageBoxFn>(*slot);
  *slot = reinterpret_cast<ULONG_PTR>(&ReportingMessageBox);
  VirtualProtect(slot, sizeof *slot, protection, &protection);
  return true;
}

}  // namespace qdmtest

#endif
