// The report: a plain text trace, one entry with a time stamp for each event. The exported
// functions of namespace dump_hlp (rcvlink.h) open, write and close it; the library itself calls
// Trace.
//
// Every layer traces while it holds locks of its own. So the report's lock is the innermost one: it
// may be taken while any other is held, and no other is taken while it is held.
#ifndef RCVLINK_REPORT_REPORT_FILE_H_
#define RCVLINK_REPORT_REPORT_FILE_H_

#include "platform/api_types.h"

namespace rcvlink {

// Writes one entry; nothing when no report is open. The formats are those of Microsoft's printf (%s
// in a wide format is a wide string); end the text in "\r\n". An entry for which there is no memory
// is left out.
void Trace(const wchar_t* format, ...) noexcept;
void Trace(const char* format, ...) noexcept;

// Whether entries are written, for callers whose texts take more than a format.
bool IsReportOpen();

// Creates the report's object, and with it its lock. Called at load, before there can be a second
// thread that needs the lock.
void PrepareReport();

}  // namespace rcvlink

#endif  // RCVLINK_REPORT_REPORT_FILE_H_
