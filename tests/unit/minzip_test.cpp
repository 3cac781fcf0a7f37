#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>
#include <vector>
#include <unistd.h>
#include <zlib.h>

#include "minzip/file_mapper.h"
#include "minzip/zip_archive.h"
#include "minzip/app_version.h"
#include "tests/unit/device_root.h"

namespace {

struct ZipFile {
  std::string name;
  std::string data;
  bool deflate = false;
};

void put16(std::string& out, uint32_t v) {
  out += static_cast<char>(v & 0xff);
  out += static_cast<char>(v >> 8 & 0xff);
}
void put32(std::string& out, uint32_t v) {
  put16(out, v & 0xffff);
  put16(out, v >> 16);
}

std::string raw_deflate(const std::string& data) {
  z_stream zs{};
  EXPECT_EQ(deflateInit2(&zs, 9, Z_DEFLATED, -MAX_WBITS, 8, Z_DEFAULT_STRATEGY), Z_OK);
  std::string out(deflateBound(&zs, data.size()), '\0');
  zs.next_in = reinterpret_cast<Bytef*>(const_cast<char*>(data.data()));
  zs.avail_in = static_cast<uInt>(data.size());
  zs.next_out = reinterpret_cast<Bytef*>(out.data());
  zs.avail_out = static_cast<uInt>(out.size());
  EXPECT_EQ(deflate(&zs, Z_FINISH), Z_STREAM_END);
  out.resize(zs.total_out);
  deflateEnd(&zs);
  return out;
}

// A plain single-disk archive; `size_skew` is added to every declared uncompressed size.
std::string build_zip(const std::vector<ZipFile>& files, int size_skew = 0) {
  std::string body;
  std::string directory;
  for (const ZipFile& f : files) {
    const std::string stored = f.deflate ? raw_deflate(f.data) : f.data;
    const auto crc = static_cast<uint32_t>(crc32(0, reinterpret_cast<const Bytef*>(f.data.data()),
                                                 static_cast<uInt>(f.data.size())));
    const uint32_t method = f.deflate ? 8 : 0;
    const auto offset = static_cast<uint32_t>(body.size());
    const auto usize = static_cast<uint32_t>(f.data.size() + size_skew);
    put32(body, 0x04034b50);
    for (uint32_t v : {20u, 0u, method, 0x5000u, 0x50b1u}) put16(body, v);
    for (uint32_t v : {crc, static_cast<uint32_t>(stored.size()), usize}) put32(body, v);
    put16(body, static_cast<uint32_t>(f.name.size()));
    put16(body, 0);
    body += f.name + stored;

    put32(directory, 0x02014b50);
    for (uint32_t v : {0x0314u, 20u, 0u, method, 0x5000u, 0x50b1u}) put16(directory, v);
    for (uint32_t v : {crc, static_cast<uint32_t>(stored.size()), usize}) put32(directory, v);
    for (uint32_t v : {static_cast<uint32_t>(f.name.size()), 0u, 0u, 0u, 0u}) put16(directory, v);
    put32(directory, 0x81a40000);
    put32(directory, offset);
    directory += f.name;
  }
  std::string zip = body + directory;
  put32(zip, 0x06054b50);
  for (uint32_t v : {0u, 0u, static_cast<uint32_t>(files.size()), static_cast<uint32_t>(files.size())}) {
    put16(zip, v);
  }
  put32(zip, static_cast<uint32_t>(directory.size()));
  put32(zip, static_cast<uint32_t>(body.size()));
  put16(zip, 0);
  return zip;
}

class MinzipTest : public DeviceRootTest {};

constexpr int kAnyNonZero = 1000;

struct VersionCase {
  const char* what;
  const char* package;  // "zip", "deflated", "other", "garbage", "none", "corrupt"
  const char* text;
  const char* build;  // property value, or null for unset
  int expected;
};

constexpr VersionCase kVersionCases[] = {
    {"matching stored", "zip", "version=QM0101_V1.0.3_20150101\n", "QM0101_V1.0.3", 0},
    {"matching deflated", "deflated", "version=QM0101_V1.0.3_20150101\n", "QM0101_V1.0.3", 0},
    {"hyphen and blanks", "zip", "ver = \t QM0202A-2.11.4\n", "QM0202A_2.11.4_user", 0},
    {"equals runs", "zip", "a==  =QM0101_V1.0.3", "xQM0101_V1.0.3", kAnyNonZero},
    {"equals runs match", "zip", "a==  =QM0101_V1.0.3", "QM0101_V1.0.3", 0},
    {"other project", "zip", "v=QM0305_V1.0.3\n", "QM0101_V1.0.3", kAnyNonZero},
    {"last project letter ignored", "zip", "v=QM0101_V1.0.3\n", "QM0109_V1.0.3", 0},
    {"other version", "zip", "v=QM0101_V1.0.4\n", "QM0101_V1.0.3", -1},
    {"all digits before the stop", "zip", "v=QM0101_V12.0.3\n", "QM0101_V12.0.3", 0},
    {"digits before the stop differ", "zip", "v=QM0101_V12.0.3\n", "QM0101_V2.0.3", -1},
    {"carriage return stays in the version", "zip", "v=QM0101_V1.0.3\r\n", "QM0101_V1.0.3", -1},
    {"no full stop", "zip", "v=QM0101_V1\n", "QM0101_V1", -1},
    {"no equals sign", "zip", "QM0101_V1.0.3\n", "QM0101_V1.0.3", -1},
    {"nothing after equals", "zip", "version== \t", "QM0101_V1.0.3", -1},
    {"property unset", "zip", "v=QM0101_V1.0.3\n", nullptr, kAnyNonZero},
    {"entry missing", "other", "v=QM0101_V1.0.3\n", "QM0101_V1.0.3", 2},
    {"package missing", "none", "", "QM0101_V1.0.3", kAnyNonZero},
    {"package not a zip", "garbage", "", "QM0101_V1.0.3", kAnyNonZero},
    {"entry does not inflate to its size", "corrupt", "v=QM0101_V1.0.3\n", "QM0101_V1.0.3", kAnyNonZero},
};

TEST_F(MinzipTest, AppVersionMatchedAgainstBuildVersion) {
  for (const VersionCase& c : kVersionCases) {
    SCOPED_TRACE(c.what);
    TearDown();
    SetUp();
    const std::string package = c.package;
    const bool deflate = package == "deflated" || package == "corrupt";
    const std::string name = package == "other" ? "apps.versions" : "apps.version";
    if (package == "garbage") {
      write_file("/sdcard/apps.zip", std::string(100, 'x'));
    } else if (package != "none") {
      write_file("/sdcard/apps.zip",
                 build_zip({{"a.apk", "apk"}, {name, c.text, deflate}}, package == "corrupt" ? 1 : 0));
    }
    if (c.build != nullptr) set_property("ro.build.version.kro", c.build);
    const int result = isAppVersionMatched();
    if (c.expected == kAnyNonZero) {
      EXPECT_NE(result, 0);
      EXPECT_NE(result, 2);
    } else {
      EXPECT_EQ(result, c.expected);
    }
  }
}

TEST_F(MinzipTest, MapsDevicePathsInsideTheRootOnly) {
  const std::string content = build_zip({{"x", "y"}});
  write_file("/sdcard/apps.zip", content);
  MemMapping map{};
  ASSERT_EQ(sys_map_file("/sdcard/apps.zip", &map), 0);
  ASSERT_EQ(map.length, content.size());
  EXPECT_EQ(std::string(reinterpret_cast<char*>(map.addr), map.length), content);
  EXPECT_EQ(map.range_count, 1u);
  sys_release_map(&map);
  EXPECT_EQ(map.addr, nullptr);

  write_file("/sdcard/empty.zip", "");
  for (const char* path : {"/sdcard/empty.zip", "/sdcard/missing.zip", "/bin/sh", "/../../bin/sh"}) {
    SCOPED_TRACE(path);
    MemMapping none{};
    EXPECT_NE(sys_map_file(path, &none), 0);
    EXPECT_EQ(none.addr, nullptr);
  }
}

// Extraction writes exactly the declared size and never past it, whatever the entry holds.
TEST_F(MinzipTest, ExtractionStaysInsideTheBuffer) {
  std::string big;
  for (int i = 0; big.size() < 100000; ++i) big += std::to_string(i * 7919) + ",";
  struct Case {
    bool deflate;
    int skew;
    bool ok;
  };
  for (const Case c : {Case{false, 0, true}, Case{true, 0, true}, Case{true, -1, false},
                       Case{true, 1, false},
                       // Stored entries are copied by their uncompressed size, in the map or not at all.
                       Case{false, 1, true}}) {
    SCOPED_TRACE(testing::Message() << c.deflate << " " << c.skew);
    const std::string zip = build_zip({{"big", big, c.deflate}}, c.skew);
    MemMapping map{reinterpret_cast<unsigned char*>(const_cast<char*>(zip.data())), zip.size(), nullptr, 0};
    ZipArchive archive{};
    ASSERT_EQ(zip_open_archive(&map, &archive), 0);
    const ZipEntry* entry = zip_find_entry(&archive, "big");
    ASSERT_NE(entry, nullptr);
    EXPECT_EQ(zip_find_entry(&archive, "bi"), nullptr);
    std::vector<unsigned char> buffer(entry->uncompressed_size + 64, 0xA5);
    EXPECT_EQ(zip_extract_entry_to_buffer(&archive, entry, buffer.data()), c.ok);
    for (size_t i = entry->uncompressed_size; i < buffer.size(); ++i) ASSERT_EQ(buffer[i], 0xA5) << i;
    if (c.ok) {
      EXPECT_EQ(std::memcmp(buffer.data(), big.data(), big.size()), 0);
    }
    zip_close_archive(&archive);
  }
}

// The name hash is hash * 31 + byte from 2, whatever the length and the bytes.
TEST(MinzipHash, EveryLengthAndByteAsTheOneByteRule) {
  std::string name;
  for (int length = 0; length <= 40; ++length) {
    uint32_t expected = 2;
    for (unsigned char c : name) expected = expected * 31 + c;
    EXPECT_EQ(zip_name_hash(name.data(), name.size()), expected) << length;
    name += static_cast<char>(0x20 + length * 37 % 0xe0);  // printable and high bytes
  }
  EXPECT_EQ(zip_name_hash("", 0), 2u);
}

// Names with the same hash share a probe sequence and are still told apart by their bytes.
TEST(MinzipHash, NamesOfEqualHashAreBothFound) {
  ASSERT_EQ(zip_name_hash("Aa", 2), zip_name_hash("BB", 2));
  const std::string zip = build_zip({{"Aa", "first"}, {"BB", "second"}});
  MemMapping map{reinterpret_cast<unsigned char*>(const_cast<char*>(zip.data())), zip.size(), nullptr, 0};
  ZipArchive archive{};
  testing::internal::CaptureStdout();
  ASSERT_EQ(zip_open_archive(&map, &archive), 0);
  EXPECT_EQ(testing::internal::GetCapturedStdout(), "");  // no duplicate
  for (const char* name : {"Aa", "BB"}) {
    const ZipEntry* entry = zip_find_entry(&archive, name);
    ASSERT_NE(entry, nullptr) << name;
    EXPECT_EQ(std::string(entry->name, entry->name_length), name);
  }
  zip_close_archive(&archive);
}

// An archive in the caller's own memory is left as it was, however far the parse reads.
TEST_F(MinzipTest, ArchiveInCallersMemoryIsReadWhole) {
  std::vector<ZipFile> files;
  for (char c : {'a', 'b', 'c'}) files.push_back({std::string(1, c), std::string(1536 * 1024, c)});
  const std::string zip = build_zip(files);
  // Page-aligned, as a mapping would be.
  void* block = nullptr;
  ASSERT_EQ(posix_memalign(&block, static_cast<size_t>(sysconf(_SC_PAGESIZE)), zip.size()), 0);
  const std::unique_ptr<void, decltype(&std::free)> owner(block, &std::free);
  auto* copy = static_cast<unsigned char*>(block);
  std::memcpy(copy, zip.data(), zip.size());
  MemMapping map{copy, zip.size(), nullptr, 0};
  ZipArchive archive{};
  ASSERT_EQ(zip_open_archive(&map, &archive), 0);
  for (const ZipFile& f : files) {
    const ZipEntry* entry = zip_find_entry(&archive, f.name.c_str());
    ASSERT_NE(entry, nullptr);
    std::vector<unsigned char> buffer(entry->uncompressed_size);
    ASSERT_TRUE(zip_extract_entry_to_buffer(&archive, entry, buffer.data()));
    EXPECT_EQ(std::string(buffer.begin(), buffer.end()), f.data);
  }
  zip_close_archive(&archive);
  EXPECT_EQ(std::memcmp(copy, zip.data(), zip.size()), 0);
}

}  // namespace
