// cfgvault: inspect and seed a configuration store from the command line.
//
//   cfgvault [--db PATH] export KEY GROUP COMPONENT
//   cfgvault [--db PATH] import FILE|-
//   cfgvault [--db PATH] list KEY GROUP COMPONENT
//   cfgvault [--db PATH] get KEY GROUP COMPONENT INSTANCE
//   cfgvault [--db PATH] delete KEY GROUP COMPONENT INSTANCE
//
// The default database is the daemon's (under ZYRD_ROOT). export prints the
// export text of every instance of the key; import replaces the stored
// instances of each key the text covers; list prints one instance id per
// line; get prints one object as in the export's "objects" list. Only
// import creates a missing database; the other commands refuse it. Exit
// status 0 on success, 1 on failure and 2 on a usage error, with a one-line
// reason on standard error.
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

#include "platform/configstore/export_codec.h"
#include "platform/configstore/sqlite_store.h"
#include "platform/util/files.h"
#include "platform/util/secure_buffer.h"

namespace {

using namespace OrnaConfigStore;

constexpr const char* kUsage =
    "usage: cfgvault [--db PATH] export KEY GROUP COMPONENT | import FILE|- | "
    "list KEY GROUP COMPONENT | get KEY GROUP COMPONENT INSTANCE | "
    "delete KEY GROUP COMPONENT INSTANCE";

struct Failure {
  int status;
  std::string reason;
};

ConfigStoreObjectId IdFrom(const std::vector<std::string>& args, bool withInstance) {
  if (args.size() != (withInstance ? 5u : 4u)) throw Failure{2, kUsage};
  ConfigStoreObjectId id(args[1], args[2], args[3]);
  if (withInstance) id.SetInstanceId(args[4]);
  return id;
}

// The text may hold keys: it goes straight into wiping memory.
Groundwork::SecureString ReadInput(const std::string& name) {
  Groundwork::SecureString text;
  if (!Groundwork::ReadSecretFile(name, &text)) {
    throw Failure{1, "cannot read " + (name == "-" ? std::string("standard input") : name) + ": " +
                         std::strerror(errno)};
  }
  return text;
}

void Print(const std::string& text) {
  std::fwrite(text.data(), 1, text.size(), stdout);
  if (std::fflush(stdout) != 0 || std::ferror(stdout)) {
    throw Failure{1, std::string("cannot write output: ") + std::strerror(errno)};
  }
}

void Run(const std::string& dbPath, const std::vector<std::string>& args) {
  const std::string& command = args[0];
  if (command == "import") {
    if (args.size() != 2) throw Failure{2, kUsage};
    std::string text(ReadInput(args[1]).view());
    Groundwork::WipeOnExit wipe(text);
    std::vector<ErrorInfo> errors;
    if (!SqliteConfigStore::Open(dbPath)->Import(text, errors)) {
      throw Failure{1, "import refused: " + (errors.empty() ? "" : errors.front().message)};
    }
    return;
  }
  bool withInstance = command == "get" || command == "delete";
  if (!withInstance && command != "export" && command != "list") throw Failure{2, kUsage};
  ConfigStoreObjectId id = IdFrom(args, withInstance);
  // Only import may make a store: reading one that is not there would
  // create an empty one and pass it off as the real thing.
  if (access(dbPath.c_str(), F_OK) != 0) {
    throw Failure{1, "no store at " + dbPath + ": " + std::strerror(errno)};
  }
  auto store = SqliteConfigStore::Open(dbPath);

  if (command == "export") {
    std::string text = store->Export({FilterSpecObject(id)});
    Groundwork::WipeOnExit wipe(text);
    Print(text);
    Print("\n");
  } else if (command == "list") {
    std::string text;
    for (const auto& object : store->GetObjectsByFilter(FilterSpecObject(id))) {
      text += object->GetConfigStoreObjectId().GetInstanceId() + "\n";
    }
    Print(text);
  } else if (command == "get") {
    auto object = store->GetObject(id);
    if (!object) throw Failure{1, "no object " + id.ToString()};
    std::string text = Codec::EncodeObject(*object);
    Groundwork::WipeOnExit wipe(text);
    Print(text);
    Print("\n");
  } else if (!store->DeleteObject(id)) {
    throw Failure{1, "no object " + id.ToString()};
  }
}

}  // namespace

int main(int argc, char** argv) {
  std::vector<std::string> args(argv + 1, argv + argc);
  std::string dbPath;
  try {
    if (args.size() >= 2 && args[0] == "--db") {
      dbPath = args[1];
      args.erase(args.begin(), args.begin() + 2);
    }
    if (args.empty()) throw Failure{2, kUsage};
    if (dbPath.empty()) dbPath = DefaultStorePath();
    Run(dbPath, args);
    return 0;
  } catch (const Failure& f) {
    std::fprintf(stderr, "cfgvault: %s\n", f.reason.c_str());
    return f.status;
  } catch (const std::exception& e) {
    std::fprintf(stderr, "cfgvault: %s\n", e.what());
    return 1;
  }
}
