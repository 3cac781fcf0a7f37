#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <filesystem>
#include <regex>
#include <string>
#include <sys/stat.h>
#include <sys/statfs.h>
#include <vector>

#include "commands/storage.h"
#include "core/command.h"
#include "services/ulda_nvram.h"
#include "tests/unit/device_root.h"
#include "tests/unit/handler_call.h"

namespace fs = std::filesystem;

namespace {

using Tree = std::vector<std::string>;

const std::string kCard = "/storage/sdcard0/";
const std::string kCfg = "/storage/sdcard0/.clear_sdcard.cfg";

class StorageTest : public DeviceRootTest {
 protected:
  void SetUp() override {
    DeviceRootTest::SetUp();
    // The keep lists outlive a run on purpose; each test starts from empty ones.
    std::memset(&clear_sdcard_keep, 0, sizeof clear_sdcard_keep);
    std::memset(&jvfn_keep, 0, sizeof jvfn_keep);
    make_dir("/storage/sdcard0");
    fs::create_symlink("storage/sdcard0", host_path("/sdcard"));
  }

  // Entries below the card: "dir/" for a directory, "name -> target" for a link, "name" for
  // anything else. Relative link targets only.
  void populate(const Tree& tree) {
    for (const std::string& entry : tree) {
      const size_t arrow = entry.find(" -> ");
      if (arrow != std::string::npos) {
        const fs::path link = host_path(kCard + entry.substr(0, arrow));
        fs::create_directories(link.parent_path());
        fs::create_symlink(entry.substr(arrow + 4), link);
      } else if (entry.back() == '/') {
        make_dir(kCard + entry);
      } else {
        write_file(kCard + entry, "data");
      }
    }
  }

  Tree card_tree() const {
    Tree tree;
    const fs::path card = host_path(kCard);
    for (auto it = fs::recursive_directory_iterator(card); it != fs::end(it); ++it) {
      const std::string relative = it->path().lexically_relative(card).string();
      if (it->is_symlink())
        tree.push_back(relative + " -> " + fs::read_symlink(it->path()).string());
      else
        tree.push_back(it->is_directory() ? relative + "/" : relative);
    }
    std::sort(tree.begin(), tree.end());
    return tree;
  }
};

// ---- clear_sdcard through AT+JVDF ----

struct ClearCase {
  const char* name;
  std::string keep_list;
  Tree before;
  Tree after;
};
void PrintTo(const ClearCase& c, std::ostream* os) { *os << c.name; }

std::vector<ClearCase> clear_cases() {
  return {
      {"top_level_file_only",
       "f apps.zip\n",
       {"apps.zip", "a.txt", ".hidden", ".sdimg_check", "DCIM/Camera/1.jpg", "sub/apps.zip", "empty/"},
       {"apps.zip"}},
      {"dir_kept_inside_is_cleaned",
       "d DCIM/Camera\nf .clear_sdcard.cfg\n",
       {"DCIM/Camera/1.jpg", "DCIM/Camera/sub/2.jpg", "DCIM/other/3.jpg", "DCIM/x.jpg", "Music/a.mp3"},
       {".clear_sdcard.cfg", "DCIM/", "DCIM/Camera/", "DCIM/Camera/1.jpg", "DCIM/Camera/sub/",
        "DCIM/Camera/sub/2.jpg"}},
      {"whole_dir_wins_over_path_inside",
       "d DCIM/Camera\nd DCIM\n",
       {"DCIM/Camera/1.jpg", "DCIM/x.jpg"},
       {"DCIM/", "DCIM/Camera/", "DCIM/Camera/1.jpg", "DCIM/x.jpg"}},
      {"prefix_without_separator_descends",
       "d DCIM2/x\n",
       {"DCIM/a.jpg", "DCIM2/x/b", "DCIM2/y"},
       {"DCIM/", "DCIM2/", "DCIM2/x/", "DCIM2/x/b"}},
      {"file_kept_in_descended_dir",
       "d Music/keep\nf Music/song.mp3\n",
       {"Music/keep/a", "Music/song.mp3", "Music/other.mp3", "song.mp3"},
       {"Music/", "Music/keep/", "Music/keep/a", "Music/song.mp3"}},
      {"separator_and_trailing_blanks",
       "# comment\n\nd:DCIM  \nf\tapps.zip \r\nx Music\nd\n",
       {"DCIM/a.jpg", "apps.zip", "Music/b.mp3"},
       {"DCIM/", "DCIM/a.jpg", "apps.zip"}},
      {"empty_keep_list", "", {"a.txt", "DCIM/a.jpg"}, {}},
      {"sdimg_check_is_never_kept", "f .sdimg_check\n", {".sdimg_check"}, {}},
      // Links are entries: removed, never descended, never kept as directories.
      {"links_are_removed_not_followed",
       "d DCIM/Camera\nd Pics/keep\n",
       {"DCIM/Camera/1.jpg", "DCIM/lnk -> ../../sdcard1", "Trash/inner -> ../../sdcard1",
        "Pics -> ../sdcard1", "top -> ../sdcard1", "abs -> /data", "dangling -> nowhere",
        "DCIM/Camera/self -> ../Camera"},
       {"DCIM/", "DCIM/Camera/", "DCIM/Camera/1.jpg", "DCIM/Camera/self -> ../Camera"}},
      {"kept_file_link_stays", "f notes\n", {"notes -> ../sdcard1/p.jpg"}, {"notes -> ../sdcard1/p.jpg"}},
  };
}

class ClearSdcard : public StorageTest, public ::testing::WithParamInterface<ClearCase> {};

TEST_P(ClearSdcard, LeavesExactlyTheKeepList) {
  const ClearCase& c = GetParam();
  // Targets outside the card that the links point at; none may be touched.
  write_file("/storage/sdcard1/p.jpg", "photo");
  write_file("/data/precious.txt", "keep");
  populate(c.before);
  write_file(kCfg, c.keep_list);
  const HandlerAnswer answer = call_handler(jvdf_handler, "AT+JVDF=1");
  EXPECT_EQ(answer.status, RESULT_OK);
  EXPECT_EQ(answer.body, "");
  EXPECT_EQ(card_tree(), c.after);
  EXPECT_EQ(read_file("/storage/sdcard1/p.jpg"), "photo");
  EXPECT_EQ(read_file("/data/precious.txt"), "keep");
}

INSTANTIATE_TEST_SUITE_P(Cases, ClearSdcard, ::testing::ValuesIn(clear_cases()),
                         [](const auto& info) { return std::string(info.param.name); });

TEST_F(StorageTest, ClearWithoutKeepListDeletesNothing) {
  populate({".sdimg_check", "a.txt", "DCIM/"});
  EXPECT_EQ(call_handler(jvdf_handler, "AT+JVDF=1").status, RESULT_ERROR);
  EXPECT_EQ(card_tree(), (Tree{".sdimg_check", "DCIM/", "a.txt"}));
  EXPECT_EQ(clear_sdcard(nullptr), 0);
  EXPECT_EQ(call_handler(jvdf_handler, "AT+JVDF=0").status, RESULT_ERROR);
}

TEST_F(StorageTest, KeepListsAreNotClearedBetweenRuns) {
  write_file(kCfg, "f .clear_sdcard.cfg\nf a.txt\nf b.txt\n");
  populate({"a.txt", "b.txt", "c.txt"});
  ASSERT_EQ(clear_sdcard(nullptr), 1);
  EXPECT_EQ(card_tree(), (Tree{".clear_sdcard.cfg", "a.txt", "b.txt"}));

  // The shorter list overwrites the first entries only: b.txt is still kept, a.txt is not.
  write_file(kCfg, "f .clear_sdcard.cfg\nf c.txt\n");
  populate({"c.txt", "d.txt"});
  ASSERT_EQ(clear_sdcard(nullptr), 1);
  EXPECT_EQ(card_tree(), (Tree{".clear_sdcard.cfg", "b.txt", "c.txt"}));
}

TEST_F(StorageTest, UpdateModeKeepsTheApplicationsPackage) {
  write_file(kCfg, "f .clear_sdcard.cfg\nf a.txt\n");
  populate({"a.txt", "apps.zip", "Music/apps.zip"});
  ASSERT_EQ(clear_sdcard("update_app"), 1);
  EXPECT_EQ(card_tree(), (Tree{".clear_sdcard.cfg", "a.txt", "apps.zip"}));
}

TEST_F(StorageTest, BadKeepListLinesAreBounded) {
  // The tail of an over-long line must not become an entry of its own.
  std::string keep = "d " + std::string(1021, 'y') + "f apps.zip\n";
  keep += "f " + std::string(5000, 'z') + "\n";
  for (int i = 0; i < 250; ++i) keep += "f keep_" + std::to_string(i) + "\n";
  for (int i = 0; i < 250; ++i) keep += "d dir_" + std::to_string(i) + "\n";
  write_file(kCfg, keep);
  populate({"apps.zip", "keep_0", "keep_199", "keep_200", "keep_249", "dir_0/", "dir_199/", "dir_200/"});
  ASSERT_EQ(clear_sdcard(nullptr), 1);
  EXPECT_EQ(card_tree(), (Tree{"dir_0/", "dir_199/", "keep_0", "keep_199"}));
}

TEST_F(StorageTest, DeletionLeavesOtherEntryTypesAndTheirDirectory) {
  write_file(kCfg, "");
  populate({"Trash/a.txt", "Trash/deep/b.txt", "c.txt"});
  ASSERT_EQ(::mkfifo(host_path(kCard + "Trash/pipe").c_str(), 0600), 0);
  ASSERT_EQ(clear_sdcard(nullptr), 1);
  EXPECT_EQ(card_tree(), (Tree{"Trash/", "Trash/pipe"}));
}

TEST_F(StorageTest, TreeDeeperThanThePathLimit) {
  write_file(kCfg, "");
  std::string deep = "Deep";
  for (int i = 0; i < 700; ++i) deep += "/d";
  populate({deep + "/bottom.txt", "Deep/top.txt", "a.txt"});
  ASSERT_EQ(clear_sdcard(nullptr), 1);
  // What fits the path limit goes; the rest stays, and nothing else is touched.
  EXPECT_FALSE(exists(kCard + "a.txt"));
  EXPECT_FALSE(exists(kCard + "Deep/top.txt"));
  EXPECT_TRUE(exists(kCard + deep + "/bottom.txt"));
}

// ---- AT+JVFN ----

struct CountCase {
  const char* name;
  Tree extra;
  int status;
};
void PrintTo(const CountCase& c, std::ostream* os) { *os << c.name; }

class LeftoverCount : public StorageTest, public ::testing::WithParamInterface<CountCase> {};

TEST_P(LeftoverCount, CountsKeptEntriesAndJudgesLeftovers) {
  write_file("/storage/sdcard1/outside/x", "x");
  write_file(kCfg, "d Music\nf readme.txt\nf .clear_sdcard.cfg\nd Music/sub\n");
  populate({"Music/a.mp3", "Music/sub/b.mp3", "Music/sub/deeper/", "Music/lnk -> ../readme.txt",
            "Music/out -> ../../sdcard1/outside", "readme.txt", "other.txt", "Pictures/p.jpg"});
  populate(GetParam().extra);
  const HandlerAnswer answer = call_handler(jvfn_handler, "AT+JVFN=0");
  EXPECT_EQ(answer.status, GetParam().status);
  // Directories: Music, sub, deeper. Files: a.mp3, b.mp3, two links, readme.txt, the list.
  EXPECT_EQ(answer.body, "\r\n\"3, 6\"\r\n");
}

INSTANTIATE_TEST_SUITE_P(Cases, LeftoverCount,
                         ::testing::Values(CountCase{"clean", {}, RESULT_OK},
                                           CountCase{"oem_file", {"oem_log.txt"}, RESULT_ERROR},
                                           CountCase{"oem_upper", {"OEM_X"}, RESULT_ERROR},
                                           CountCase{"oem_dir", {"oem_dir/"}, RESULT_OK},
                                           CountCase{"dcim", {"DCIM/"}, RESULT_ERROR},
                                           CountCase{"camera", {"Camera"}, RESULT_ERROR},
                                           CountCase{"camera_chinese", {"相机/"}, RESULT_ERROR},
                                           CountCase{"apps_zip", {"apps.zip"}, RESULT_ERROR},
                                           CountCase{"amr", {"factory_test.amr"}, RESULT_ERROR},
                                           CountCase{"krolog", {"krolog/"}, RESULT_ERROR},
                                           CountCase{"mtklog", {"mtklog"}, RESULT_ERROR},
                                           CountCase{"sdimg", {".sdimg_check"}, RESULT_ERROR}),
                         [](const auto& info) { return std::string(info.param.name); });

TEST_F(StorageTest, CountWithoutKeepListFails) {
  populate({"Music/a.mp3"});
  EXPECT_EQ(call_handler(jvfn_handler, "AT+JVFN=0").status, RESULT_ERROR);
  EXPECT_EQ(call_handler(jvfn_handler, "AT+JVFN=0").body, "");
  int dirs = 0;
  int files = 0;
  traversal_directory("/storage/sdcard0", &dirs, &files);
  EXPECT_EQ(dirs, 1);
  EXPECT_EQ(files, 1);
}

// ---- Shell-backed checks ----

constexpr const char* kMountsCommand = "/system/bin/sh -c \"cat /proc/mounts > /sdcard/mount.txt\"";
constexpr const char* kLsInputCommand = "/system/bin/sh -c \"ls /dev/input > /data/getevent\"";
constexpr const char* kRmGeteventCommand = "/system/bin/sh -c \"rm /data/getevent\"";
constexpr const char* kDuCommand = "/system/bin/sh -c \"du -sk /storage/sdcard0/ > /data/udroom\"";
constexpr const char* kCalibrateCommand =
    "/system/bin/sh -c \"vdc volume calibrate /storage/sdcard0\"";

struct ShellCase {
  const char* name;
  std::string emulate;  // empty: property unset
  std::string output;   // what the tool writes; empty: nothing
  int status;
};
void PrintTo(const ShellCase& c, std::ostream* os) { *os << c.name; }

class MountCheck : public StorageTest, public ::testing::WithParamInterface<ShellCase> {};

TEST_P(MountCheck, ReadsTheMountTableOnce) {
  const ShellCase& c = GetParam();
  if (!c.emulate.empty()) set_property("persist.sys.primary.emulate", c.emulate);
  shell_action() = [this, &c](const std::string& command) {
    if (command == kMountsCommand && !c.output.empty()) write_file("/sdcard/mount.txt", c.output);
    return 0;
  };
  EXPECT_EQ(call_handler(jvsd_handler, "AT+JVSD=0").status, c.status);
  EXPECT_EQ(shell_commands(), std::vector<std::string>{kMountsCommand});
  EXPECT_FALSE(exists("/storage/sdcard0/mount.txt"));
}

const std::string kPhysicalMounts =
    "/dev/block/vold/179:65 /storage/sdcard0 vfat rw,dirsync,nosuid 0 0\n";
const std::string kEmulatedMounts = "/dev/fuse /mnt/shell/emulated fuse rw,nosuid 0 0\n";

INSTANTIATE_TEST_SUITE_P(Cases, MountCheck,
                         ::testing::Values(ShellCase{"physical", "", kPhysicalMounts, RESULT_OK},
                                           ShellCase{"physical_set", "0", kPhysicalMounts, RESULT_OK},
                                           ShellCase{"physical_missing", "0", kEmulatedMounts, RESULT_ERROR},
                                           ShellCase{"emulated", "1", kEmulatedMounts, RESULT_OK},
                                           ShellCase{"emulated_missing", "1", kPhysicalMounts, RESULT_ERROR},
                                           ShellCase{"other_mode", "2", kPhysicalMounts, RESULT_ERROR},
                                           ShellCase{"no_output", "0", "", RESULT_ERROR}),
                         [](const auto& info) { return std::string(info.param.name); });

class OtgMouse : public StorageTest, public ::testing::WithParamInterface<ShellCase> {};

TEST_P(OtgMouse, LooksForAMouseAndAlwaysRemovesTheList) {
  const ShellCase& c = GetParam();
  shell_action() = [this, &c](const std::string& command) {
    if (command == kLsInputCommand && !c.output.empty()) write_file("/data/getevent", c.output);
    return 0;
  };
  EXPECT_EQ(call_handler(jvotg_handler, "AT+JVOTG=1").status, c.status);
  EXPECT_EQ(shell_commands(), (std::vector<std::string>{kLsInputCommand, kRmGeteventCommand}));
}

INSTANTIATE_TEST_SUITE_P(Cases, OtgMouse,
                         ::testing::Values(ShellCase{"mouse", "", "event0\nevent1\nmouse0\n", RESULT_OK},
                                           ShellCase{"last_line_unended", "", "event0\nmouse0", RESULT_OK},
                                           ShellCase{"no_mouse", "", "event0\nmice_\n", RESULT_ERROR},
                                           ShellCase{"no_list", "", "", RESULT_ERROR}),
                         [](const auto& info) { return std::string(info.param.name); });

TEST_F(StorageTest, InternalStorageSize) {
  const std::regex sizes("\r\n\"([0-9]+\\.[0-9]{2}),([0-9]+\\.[0-9]{3})\"\r\n");
  std::smatch match;
  HandlerAnswer answer = call_handler(jvudroom_handler, "AT+JVUDROOM=0");
  ASSERT_EQ(answer.status, RESULT_OK);
  ASSERT_TRUE(std::regex_match(answer.body, match, sizes)) << answer.body;
  struct statfs st {};
  ASSERT_EQ(::statfs(host_path(kCard).c_str(), &st), 0);
  const double total_gb = static_cast<double>(st.f_blocks) * st.f_bsize / (1 << 30);
  EXPECT_NEAR(std::stod(match[1]), total_gb, 0.006);
  EXPECT_TRUE(shell_commands().empty());

  set_property("persist.sys.primary.emulate", "1");
  make_dir("/data");
  shell_action() = [this](const std::string& command) {
    if (command == kDuCommand) write_file("/data/udroom", "2048\t/storage/sdcard0/\n");
    return 0;
  };
  answer = call_handler(jvudroom_handler, "AT+JVUDROOM=0");
  ASSERT_EQ(answer.status, RESULT_OK);
  ASSERT_TRUE(std::regex_match(answer.body, match, sizes)) << answer.body;
  EXPECT_EQ(match[2], "2.000");
  EXPECT_EQ(shell_commands(), (std::vector<std::string>{kDuCommand, kRmGeteventCommand}));

  ::unlink(host_path("/data/udroom").c_str());
  shell_action() = nullptr;
  EXPECT_EQ(call_handler(jvudroom_handler, "AT+JVUDROOM=0").status, RESULT_ERROR);

  set_property("persist.sys.primary.emulate", "2");
  answer = call_handler(jvudroom_handler, "AT+JVUDROOM=0");
  EXPECT_EQ(answer.status, RESULT_OK);
  EXPECT_EQ(answer.body, "");
  EXPECT_EQ(call_handler(jvudroom_handler, "AT+JVUDROOM=1").status, RESULT_ERROR);
}

// ---- Plain file checks ----

struct FileCase {
  const char* name;
  CommandHandler handler;
  const char* line;
  std::vector<std::pair<std::string, std::string>> files;  // "dir/" content makes a directory
  int status;
  std::string body;
};
void PrintTo(const FileCase& c, std::ostream* os) { *os << c.name; }

class StorageQuery : public StorageTest, public ::testing::WithParamInterface<FileCase> {};

TEST_P(StorageQuery, Answers) {
  const FileCase& c = GetParam();
  for (const auto& [path, content] : c.files) {
    if (path.back() == '/')
      make_dir(path);
    else
      write_file(path, content);
  }
  const HandlerAnswer answer = call_handler(c.handler, c.line);
  EXPECT_EQ(answer.status, c.status);
  EXPECT_EQ(answer.body, c.body);
}

INSTANTIATE_TEST_SUITE_P(
    Cases, StorageQuery,
    ::testing::ValuesIn(std::vector<FileCase>{
        {"tf_version", tfst_handler, "AT+TFST=0", {{"/storage/sdcard1/.sdcard_version", "V2.1\nnext\n"}}, RESULT_OK, "\r\n\"V2.1\n\"\r\n"},
        {"tf_version_mnt_first", tfst_handler, "AT+TFST=0", {{"/mnt/sdcard/.sdcard_version", "A\n"}, {"/storage/sdcard1/.sdcard_version", "B\n"}}, RESULT_OK, "\r\n\"A\n\"\r\n"},
        {"tf_version_long", tfst_handler, "AT+TFST=0", {{"/storage/sdcard1/.sdcard_version", std::string(40, 'v')}}, RESULT_OK, "\r\n\"" + std::string(31, 'v') + "\"\r\n"},
        {"tf_version_missing", tfst_handler, "AT+TFST=0", {}, RESULT_ERROR, ""},
        {"tf_version_other", tfst_handler, "AT+TFST=1", {{"/storage/sdcard1/.sdcard_version", "V\n"}}, RESULT_ERROR, ""},
        {"tf_access", jvtfwr_handler, "AT+JVTFWR=0", {{"/storage/sdcard1/", ""}}, RESULT_OK, ""},
        {"tf_access_missing", jvtfwr_handler, "AT+JVTFWR=0", {}, RESULT_ERROR, ""},
        {"ud_access", jvudwr_handler, "AT+JVUDWR=0", {}, RESULT_OK, ""},
        {"ud_access_other", jvudwr_handler, "AT+JVUDWR=1", {}, RESULT_ERROR, ""},
    }),
    [](const auto& info) { return std::string(info.param.name); });

// ---- AT+JVSDCALI ----

class Calibration : public StorageTest {
 protected:
  std::string record() {
    std::string bytes(ULDA_NVRAM_SIZE, '\0');
    for (size_t i = 0; i < bytes.size(); ++i) bytes[i] = static_cast<char>(i * 7 + 1);
    const int32_t flag = 77;
    std::memcpy(bytes.data() + 264, &flag, sizeof flag);
    return bytes;
  }
};

TEST_F(Calibration, QueryAnswersTheFlagAtItsOffset) {
  write_file("/persist/ulda_nvram", record());
  const HandlerAnswer answer = call_handler(jvsdcali_handler, "AT+JVSDCALI=0");
  EXPECT_EQ(answer.status, RESULT_OK);
  EXPECT_EQ(answer.body, "\r\n\"77\"\r\n");
}

TEST_F(Calibration, FailuresLeaveTheRecordAsItWas) {
  EXPECT_EQ(call_handler(jvsdcali_handler, "AT+JVSDCALI=0").status, RESULT_ERROR);
  EXPECT_EQ(call_handler(jvsdcali_handler, "AT+JVSDCALI=1").status, RESULT_ERROR);
  EXPECT_TRUE(shell_commands().empty());  // no record, no calibration

  write_file("/persist/ulda_nvram", record());
  for (const int status : {-1, 1 << 8, 0}) {
    shell_commands().clear();
    shell_action() = [status](const std::string&) { return status; };
    // A status of 0 still fails: the size did not change on this machine.
    EXPECT_EQ(call_handler(jvsdcali_handler, "AT+JVSDCALI=1").status, RESULT_ERROR) << status;
    EXPECT_EQ(shell_commands(), std::vector<std::string>{kCalibrateCommand});
    EXPECT_EQ(read_file("/persist/ulda_nvram"), record());
  }
  EXPECT_EQ(call_handler(jvsdcali_handler, "AT+JVSDCALI=2").status, RESULT_ERROR);
}

}  // namespace

TEST_F(Calibration, ChangedSizeSetsTheFlagAndKeepsEveryOtherByte) {
  make_dir("/storage/sdcard0");
  write_file("/persist/ulda_nvram", record());
  // The calibration tool makes the storage report another size, as vdc does on a phone.
  shell_action() = [this](const std::string&) {
    write_file("/.emu/statfs", "/storage/sdcard0 1234\n");
    return 0;
  };
  EXPECT_EQ(call_handler(jvsdcali_handler, "AT+JVSDCALI=1").status, RESULT_OK);
  std::string expected = record();
  const int32_t calibrated = 88;
  std::memcpy(expected.data() + 264, &calibrated, sizeof calibrated);
  EXPECT_EQ(read_file("/persist/ulda_nvram"), expected);
  // Calibrating again does not change the size any more: refused, record untouched.
  EXPECT_EQ(call_handler(jvsdcali_handler, "AT+JVSDCALI=1").status, RESULT_ERROR);
  EXPECT_EQ(read_file("/persist/ulda_nvram"), expected);
}
