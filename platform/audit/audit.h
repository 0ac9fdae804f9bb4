// Host audit records: one JSON object per line in var/log/zyrd/audit.log
// (under the root), written with a single write(2) per record so records of
// concurrent calls never interleave:
//   {"time":"2024-05-01T12:00:00.123Z","eventId":"api.call","subject":"root",
//    "object":"com.tarsel.orna.kms.status:get","success":true,"opId":"op-7"}
// The other attributes follow the five fixed members in the order given.
//
// All functions are thread-safe.
#pragma once

#include <string>
#include <string_view>

struct TslAudit_Attr {
  const char* name;
  const char* value;
};

// Writes one record. `attrs` is a list closed by an entry whose name is null
// or empty. Returns false when the record could not be written (the failure
// is logged).
bool TslAudit_LogList(const char* eventId, const char* subject, const char* object, bool success,
                      const TslAudit_Attr* attrs);

namespace Tsl::Audit {

// Where records go. The default sink appends to the audit log file, which is
// created (0600, its directory 0700) when the first record is written.
class AuditSink {
 public:
  virtual ~AuditSink() = default;
  // `line` is one complete record ending in a line feed.
  virtual bool Write(std::string_view line) = 0;
};

// Replaces the sink; nullptr restores the file sink. The sink must outlive
// its installation.
void SetAuditSink(AuditSink* sink);

// The record line TslAudit_LogList writes, with `timeUs` (microseconds since
// the Unix epoch) as its time.
std::string FormatRecord(int64_t timeUs, const char* eventId, const char* subject,
                         const char* object, bool success, const TslAudit_Attr* attrs);

}  // namespace Tsl::Audit
