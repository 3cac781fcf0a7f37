#include "minzip/app_version.h"

#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>

#include "core/log.h"
#include "minzip/SysUtil.h"
#include "minzip/Zip.h"
#include "platform/platform.h"

namespace {

constexpr char kPackagePath[] = "/sdcard/apps.zip";
constexpr char kVersionEntry[] = "apps.version";
constexpr char kBuildVersionProperty[] = "ro.build.version.kro";

struct MappedArchive {
  MemMapping map{};
  ZipArchive archive{};
  bool opened = false;
  ~MappedArchive() {
    if (opened) zip_close_archive(&archive);
    if (map.addr != nullptr) sys_release_map(&map);
  }
};

struct FreeDeleter {
  void operator()(char* p) const { std::free(p); }
};
using TextBuffer = std::unique_ptr<char, FreeDeleter>;

// Reads the version entry into a NUL-terminated buffer; *status tells why when it returns null.
TextBuffer read_version_text(int* status) {
  MappedArchive package;
  *status = -1;
  if (sys_map_file(kPackagePath, &package.map) != 0) {
    ATCI_LOGE("failed to map file %s", kPackagePath);
    return nullptr;
  }
  const int err = zip_open_archive(&package.map, &package.archive);
  if (err != 0) {
    ATCI_LOGE("Can't open %s\n(%s)\n", kPackagePath, std::strerror(err));
    return nullptr;
  }
  package.opened = true;
  const ZipEntry* entry = zip_find_entry(&package.archive, kVersionEntry);
  if (entry == nullptr) {
    *status = 2;
    return nullptr;
  }
  TextBuffer text(static_cast<char*>(std::calloc(size_t{entry->uncompressed_size} + 1, 1)));
  if (text == nullptr ||
      !zip_extract_entry_to_buffer(&package.archive, entry, reinterpret_cast<unsigned char*>(text.get()))) {
    ATCI_LOGE("Can't extract file");
    return nullptr;
  }
  return text;
}

// Compares "<project>_<...><digits>.<...>" against the build version property.
int match_build_version(const char* value) {
  char prop[PROPERTY_VALUE_MAX] = {};
  property_get(kBuildVersionProperty, prop, "");
  ATCI_LOGD("prop: %s", prop);

  const size_t n = std::strcspn(value, "_-");
  const std::string project(value, n);
  ATCI_LOGD("app: %s, %d", project.c_str(), static_cast<int>(n));
  // One character fewer than the project name is compared, as the packages expect.
  if (std::strncmp(value, prop, n > 0 ? n - 1 : 0) != 0) {
    ATCI_LOGE("Project name is not matched!!!");
    return -1;
  }

  const char* stop = std::strchr(value + n, '.');
  if (stop == nullptr) return -1;
  const char* start = stop;
  while (start > value + n && start[-1] >= '0' && start[-1] <= '9') --start;
  const std::string version(start, std::strcspn(start, "_\n"));
  ATCI_LOGD("last version: %s %s end", prop, version.c_str());
  return std::strstr(prop, version.c_str()) != nullptr ? 0 : -1;
}

}  // namespace

int isAppVersionMatched() {
  int status = 0;
  const TextBuffer text = read_version_text(&status);
  if (text == nullptr) return status;
  ATCI_LOGD("apps_version: %s", text.get());

  const char* value = std::strchr(text.get(), '=');
  if (value == nullptr) return -1;
  value += std::strspn(value, "= \t");
  if (*value == '\0') return -1;
  return match_build_version(value);
}
