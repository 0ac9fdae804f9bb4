#include "platform/audit/audit.h"

#include <errno.h>
#include <fcntl.h>
#include <string.h>
#include <sys/stat.h>
#include <time.h>
#include <unistd.h>

#include <atomic>
#include <boost/json/object.hpp>
#include <boost/json/serialize.hpp>
#include <cstdio>
#include <mutex>

#include "platform/util/files.h"
#include "platform/util/hostinfo.h"
#include "platform/util/log.h"
#include "platform/util/paths.h"

namespace Tsl::Audit {
namespace {

constexpr const char* kAuditLogPath = "/var/log/zyrd/audit.log";

// Appends to the audit log. The file is opened on first use and kept open;
// a failed open is retried with the next record and logged once per run of
// failures.
class FileSink final : public AuditSink {
 public:
  bool Write(std::string_view line) override {
    int fd = Descriptor();
    if (fd < 0) return false;
    ssize_t n = ::write(fd, line.data(), line.size());
    if (n != static_cast<ssize_t>(line.size())) {
      Log_Level(2, "Failed to write audit record: %s\n", n < 0 ? strerror(errno) : "short write");
      return false;
    }
    return true;
  }

 private:
  int Descriptor() {
    int fd = fd_.load(std::memory_order_acquire);
    if (fd >= 0) return fd;
    std::lock_guard<std::mutex> lock(mutex_);
    if (fd_.load() >= 0) return fd_.load();
    std::string path = Groundwork::RootPath(kAuditLogPath);
    std::string dir = path.substr(0, path.rfind('/'));
    Groundwork::MakeDirectories(dir, 0700);
    fd = ::open(path.c_str(), O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0600);
    if (fd < 0) {
      if (!failing_) Log_Level(2, "Cannot open audit log %s: %s\n", path.c_str(), strerror(errno));
      failing_ = true;
    } else {
      failing_ = false;
      fd_.store(fd, std::memory_order_release);
    }
    return fd;
  }

  std::mutex mutex_;
  std::atomic<int> fd_{-1};
  bool failing_ = false;
};

FileSink& DefaultSink() {
  static FileSink* sink = new FileSink();  // kept for the life of the process
  return *sink;
}

std::atomic<AuditSink*> gSink{nullptr};

}  // namespace

void SetAuditSink(AuditSink* sink) { gSink.store(sink); }

std::string FormatRecord(int64_t timeUs, const char* eventId, const char* subject,
                         const char* object, bool success, const TslAudit_Attr* attrs) {
  boost::json::object record;
  record["time"] = Groundwork::FormatUtcMillis(timeUs);
  record["eventId"] = eventId != nullptr ? eventId : "";
  record["subject"] = subject != nullptr ? subject : "";
  record["object"] = object != nullptr ? object : "";
  record["success"] = success;
  for (const TslAudit_Attr* a = attrs; a != nullptr && a->name != nullptr && a->name[0] != '\0';
       ++a) {
    // The fixed members keep their meaning whatever an attribute is called.
    if (record.contains(a->name)) continue;
    record[a->name] = a->value != nullptr ? a->value : "";
  }
  std::string line = boost::json::serialize(record);
  line += '\n';
  return line;
}

}  // namespace Tsl::Audit

bool TslAudit_LogList(const char* eventId, const char* subject, const char* object, bool success,
                      const TslAudit_Attr* attrs) {
  std::string line =
      Tsl::Audit::FormatRecord(Hostinfo_GetTimeOfDay(), eventId, subject, object, success, attrs);
  Tsl::Audit::AuditSink* sink = Tsl::Audit::gSink.load();
  return sink != nullptr ? sink->Write(line) : Tsl::Audit::DefaultSink().Write(line);
}
