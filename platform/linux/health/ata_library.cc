#include "platform/linux/health/ata_library.h"

#include <dlfcn.h>
#include <string>

namespace tavrel::health {
namespace {

// The name that a linked program would load; it guarantees the interface of the header.
constexpr const char* kFile = "libatasmart.so.4";

template <class Function>
bool find(void* library, const char* name, Function& function) {
  function = reinterpret_cast<Function>(dlsym(library, name));
  return function != nullptr;
}

Expected<AtaLibrary> load() {
  AtaLibrary functions;
  // Never unloaded: the functions found in it are used until the process ends.
  void* const library = dlopen(kFile, RTLD_NOW | RTLD_LOCAL);
  if (library != nullptr && find(library, "sk_disk_open", functions.open) &&
      find(library, "sk_disk_free", functions.free) &&
      find(library, "sk_disk_check_sleep_mode", functions.check_sleep_mode) &&
      find(library, "sk_disk_smart_read_data", functions.smart_read_data) &&
      find(library, "sk_disk_smart_status", functions.smart_status) &&
      find(library, "sk_disk_get_blob", functions.get_blob) &&
      find(library, "sk_disk_set_blob", functions.set_blob) &&
      find(library, "sk_disk_smart_parse_attributes", functions.smart_parse_attributes) &&
      find(library, "sk_disk_smart_get_temperature", functions.smart_get_temperature) &&
      find(library, "sk_disk_smart_get_power_on", functions.smart_get_power_on) &&
      find(library, "sk_disk_smart_get_power_cycle", functions.smart_get_power_cycle) &&
      find(library, "sk_disk_smart_get_bad", functions.smart_get_bad)) {
    return functions;
  }
  const char* const reason = dlerror();
  return Error{std::string("cannot load libatasmart: ") + (reason != nullptr ? reason : kFile) +
               ": install the package libatasmart4"};
}

}  // namespace

Expected<const AtaLibrary*> ataLibrary() {
  static const Expected<AtaLibrary> functions = load();
  if (!functions) return functions.error();
  return &*functions;
}

}  // namespace tavrel::health
