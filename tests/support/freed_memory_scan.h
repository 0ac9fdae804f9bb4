// Looks at every heap block the test binary frees while a scan runs and
// counts those that still hold one of the scan's secrets: a secret buffer
// that is released without being overwritten shows up here, where a check
// of the buffer's size or emptiness cannot see it. Linking
// freed_memory_scan.cc replaces the binary's global operator new and delete;
// memory that C libraries (SQLite, OpenSSL) allocate and free themselves is
// not looked at.
#pragma once

#include <initializer_list>
#include <string>
#include <string_view>
#include <vector>

namespace ZyrdTest {

class FreedMemoryScan {
 public:
  enum class Threads { kAll, kOthers };  // kOthers: not the thread that started the scan

  explicit FreedMemoryScan(std::initializer_list<std::string_view> secrets,
                           Threads threads = Threads::kAll);
  ~FreedMemoryScan() { Stop(); }
  FreedMemoryScan(const FreedMemoryScan&) = delete;
  FreedMemoryScan& operator=(const FreedMemoryScan&) = delete;

  // Ends the scan; the number of freed blocks that held a secret. The stack
  // of the first such release goes to standard error.
  int Stop();

 private:
  std::vector<std::string> secrets_;
};

}  // namespace ZyrdTest
