#include "Shims.h"

#include <string>
#include <unordered_map>

namespace {

constexpr shims::Table (*kTables[])() = {
    &shims::copyfile,  &shims::coreFoundation, &shims::ctype,      &shims::cxxabi,     &shims::dirent,
    &shims::dispatch,  &shims::dlfcn,          &shims::errnoTable, &shims::execinfo,   &shims::fcntl,
    &shims::machine,   &shims::math,           &shims::nlTypes,    &shims::osLock,     &shims::osLog,
    &shims::osSync,    &shims::pthread,        &shims::regex,      &shims::signal,     &shims::stdio,
    &shims::stdlib,    &shims::string,         &shims::sysEvent,   &shims::sysMman,    &shims::sysResource,
    &shims::sysSelect, &shims::sysSocket,      &shims::sysStat,    &shims::sysStatvfs, &shims::sysWait,
    &shims::time,      &shims::unistd,         &shims::wchar,      &shims::xlocale,
};

}  // namespace

const void* shimNamed(std::string_view name) {
  static const auto& all = []() -> auto& {
    auto& map = *new std::unordered_map<std::string_view, const void*>;
    for (const auto table : kTables) {
      for (const Shim& each : table()) {
        if (!map.emplace(each.name, each.address).second) {
          refuse("two shims are named %s", std::string(each.name).c_str());
        }
      }
    }
    return map;
  }();
  const auto found = all.find(name);
  return found == all.end() ? nullptr : found->second;
}
