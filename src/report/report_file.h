// The report: a plain text trace, one stamped entry an event. The exported functions of namespace
// dump_hlp (rcvlink.h) open, write and close it; the library itself traces with Trace.
//
// The report's lock is the innermost of the library: it may be taken under any other, and nothing
// else is taken under it.
#ifndef RCVLINK_REPORT_REPORT_FILE_H_
#define RCVLINK_REPORT_REPORT_FILE_H_

#include "platform/api_types.h"

// Writes one entry, dropped silently when no report is open. The formats are those of Microsoft's
// printf (%s in a wide format is a wide string); end the text in "\r\n". Raises E_INVALIDARG for a
// null format and E_FAIL for one that cannot be measured.
void Trace(const wchar_t* format, ...);
void Trace(const char* format, ...);

// Makes the report's lock, at load.
void PrepareReport();

#endif  // RCVLINK_REPORT_REPORT_FILE_H_
