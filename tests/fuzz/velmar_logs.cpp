// The decoders of Velmar's replies: each log, its header, the fields, the acknowledgement.
#include "tests/fuzz/target.h"
#include "velmar/fields.h"
#include "velmar/log_header.h"
#include "velmar/logs.h"
#include "velmar/response.h"

void fuzz::Target(std::span<const uint8_t> bytes) {
  using namespace VelmarCommands;
  Input input(bytes);
  const uint8_t kind = input.Byte();
  const std::vector<char> rest = input.RestAlone();
  const std::string_view text(rest.data(), rest.size());
  VersionLog version;
  FileEntries entries;
  FileHeaderLog header;
  PortConfigLog config;
  switch (kind % 7) {
    case 0:
      DecodeVersion(text, version);
      break;
    case 1:
      DecodeDirectory(text, entries);
      break;
    case 2:
      DecodeFileHeader(text, header);
      break;
    case 3:
      DecodePortConfig(text, L"COM1", config);
      break;
    case 4:
      for (const std::wstring& field : SplitFields(text)) ToInteger(WithoutQuotes(field));
      break;
    case 5:
      ParseHeaderFields(text);
      break;
    default:
      if (RecogniseResponse(text).prompt_end > text.size()) std::abort();
  }
}
