// SheetKeptMemory FILE: the bytes a sheet keeps after a plain import of the
// UTF-8 document FILE under the built-in schema, and the document's UTF-16
// size. tools/bench-command.py reads both to set the styles command's memory
// goal: 2.5 times the UTF-16 text plus what the sheet keeps.
#include <StylesTools/Schema.h>

#include <Styles/StyleSheet.h>

#include <ZelPlatform/ZelString.h>

#include <malloc.h>

#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <iterator>
#include <new>
#include <string>

#include "CountingAllocator.h"

int main(int argc, char** argv) {
  if (argc != 2) {
    std::fprintf(stderr, "usage: SheetKeptMemory FILE\n");
    return 2;
  }
  Styles::Tools::SchemaRegistration registration;
  Styles::Tools::SchemaError error;
  if (!Styles::Tools::RegisterSchema(Styles::Tools::DefaultSchema(), registration, error))
    return 2;
  std::size_t textBytes = 0, kept = 0;
  bool imported = false;
  {
    Styles::StyleSheet sheet;
    const std::size_t before = g_bytesInUse;
    {
      std::ifstream file(argv[1], std::ios::binary);
      const std::string bytes{std::istreambuf_iterator<char>(file),
                              std::istreambuf_iterator<char>()};
      const ZelStringT<char16_t> text(ZelPlatform::Utf8ToUtf16(bytes));
      textBytes = text.GetLength() * sizeof(char16_t);
      imported = sheet.ImportFromString(text, true);
    }
    kept = g_bytesInUse - before;
  }
  Styles::Tools::DeregisterSchema(registration);
  if (!imported) {
    std::fprintf(stderr, "%s: the document does not import\n", argv[1]);
    return 1;
  }
  std::printf("kept_bytes %zu\nutf16_bytes %zu\n", kept, textBytes);
  return 0;
}
