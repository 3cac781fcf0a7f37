#include "commands/storage.h"

#include <sys/stat.h>
#include <sys/statfs.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>

#include "tests/unit/handler_call.h"
#include "tests/unit/handler_case.h"

namespace fs = std::filesystem;

namespace {

constexpr int OK = RESULT_OK;
constexpr int ERR = RESULT_ERROR;
const std::string kCard = "/storage/sdcard0/";
const std::string kCfg = kCard + ".clear_sdcard.cfg";
const std::string kMounts = "/system/bin/sh -c \"cat /proc/mounts > /sdcard/mount.txt\"";
const std::string kLsInput = "/system/bin/sh -c \"ls /dev/input > /data/getevent\"";
const std::string kRmGetevent = "/system/bin/sh -c \"rm /data/getevent\"";
const std::string kDu = "/system/bin/sh -c \"du -sk /storage/sdcard0/ > /data/udroom\"";
const std::string kCalibrate = "/system/bin/sh -c \"vdc volume calibrate /storage/sdcard0\"";
const std::string kPhysical = "/dev/block/vold/179:65 /storage/sdcard0 vfat rw,dirsync,nosuid 0 0\n";
const std::string kEmulated = "/dev/fuse /mnt/shell/emulated fuse rw,nosuid 0 0\n";
const std::string kVersion = "/storage/sdcard1/.sdcard_version";
const Pairs kCardDir = {{kCard + ".keep", ""}};

Pairs emulate(const std::string& mode) { return {{"prop:persist.sys.primary.emulate", mode}}; }
Pairs mount_text(const std::string& text) { return {{"/sdcard/mount.txt", text}}; }
const Pairs kCalibrated = {{"/.emu/statfs", "/storage/sdcard0 1234\n"}};  // vdc changed the size

const HandlerCase kRows[] = {
    {"tf_version", tfst_handler, "AT+TFST=0", {{kVersion, "V2.1\nnext\n"}}, OK, "\r\n\"V2.1\n\"\r\n"},
    {"tf_version_mnt_first", tfst_handler, "AT+TFST=0", {{"/mnt/sdcard/.sdcard_version", "A\n"}, {kVersion, "B\n"}}, OK, "\r\n\"A\n\"\r\n"},
    {"tf_version_long", tfst_handler, "AT+TFST=0", {{kVersion, std::string(40, 'v')}}, OK, "\r\n\"" + std::string(31, 'v') + "\"\r\n"},
    {"tf_access", jvtfwr_handler, "AT+JVTFWR=0", {{"/storage/sdcard1/.keep", ""}}, OK, ""},
    {"ud_access", jvudwr_handler, "AT+JVUDWR=0", kCardDir, OK, ""},
    // The mount table is read once through a scratch file on the card, which goes.
    {"mounted", jvsd_handler, "AT+JVSD=0", {}, OK, "", {kMounts}, {{"/sdcard/mount.txt", kAbsent}}, nullptr, nullptr, 0, mount_text(kPhysical)},
    {"mounted_missing", jvsd_handler, "AT+JVSD=0", {}, ERR, "", {kMounts}, {{"/sdcard/mount.txt", kAbsent}}, nullptr, nullptr, 0, mount_text(kEmulated)},
    {"emulated", jvsd_handler, "AT+JVSD=0", emulate("1"), OK, "", {kMounts}, {}, nullptr, nullptr, 0, mount_text(kEmulated)},
    {"emulated_missing", jvsd_handler, "AT+JVSD=0", emulate("1"), ERR, "", {kMounts}, {}, nullptr, nullptr, 0, mount_text(kPhysical)},
    {"mount_other_mode", jvsd_handler, "AT+JVSD=0", emulate("2"), ERR, "", {kMounts}, {}, nullptr, nullptr, 0, mount_text(kPhysical)},
    {"mount_no_output", jvsd_handler, "AT+JVSD=0", {}, ERR, "", {kMounts}},
    // The input list is always removed, mouse or not.
    {"otg_mouse", jvotg_handler, "AT+JVOTG=1", {}, OK, "", {kLsInput, kRmGetevent}, {}, nullptr, nullptr, 0, {{"/data/getevent", "event0\nmouse0\n"}}},
    {"otg_no_mouse", jvotg_handler, "AT+JVOTG=1", {}, ERR, "", {kLsInput, kRmGetevent}, {}, nullptr, nullptr, 0, {{"/data/getevent", "event0\nmice_\n"}}},
    {"otg_no_list", jvotg_handler, "AT+JVOTG=1", {}, ERR, "", {kLsInput, kRmGetevent}},
    // Emulated storage: the size of /data, the use as du counts it; the input list is removed.
    {"room_emulated", jvudroom_handler, "AT+JVUDROOM=0", {{"/.emu/statfs", "/data 1\n"}, {"prop:persist.sys.primary.emulate", "1"}}, OK, "\r\n\"0.00,2.000\"\r\n", {kDu, kRmGetevent}, {}, nullptr, nullptr, 0, {{"/data/udroom", "2048\t/storage/sdcard0/\n"}}},
    {"room_emulated_no_du", jvudroom_handler, "AT+JVUDROOM=0", emulate("1"), ERR, "", {kDu, kRmGetevent}},
    {"room_other_mode", jvudroom_handler, "AT+JVUDROOM=0", emulate("2"), OK, ""},
    {"clear_no_keep_list", jvdf_handler, "AT+JVDF=1", {{kCard + ".sdimg_check", "x"}}, ERR, "", {}, {{kCard + ".sdimg_check", "x"}}},
    {"count_no_keep_list", jvfn_handler, "AT+JVFN=0", kCardDir, ERR, ""},
    {"count_dirs_only", jvfn_handler, "AT+JVFN=0", {{kCfg, "d Music\n"}, {kCard + "Music/a", ""}}, OK, "\r\n\"1, 1\"\r\n"},
    // Calibration: only a size that changed sets the flag; every other byte of the record stays.
    {"cali_query", jvsdcali_handler, "AT+JVSDCALI=0", {}, OK, "\r\n\"77\"\r\n", {}, {}, [](ulda_nvram& r) { r.sdcard_cali_flag = 77; }},
    {"cali_size_changed", jvsdcali_handler, "AT+JVSDCALI=1", kCardDir, OK, "", {kCalibrate}, {}, nullptr, [](ulda_nvram& r) { r.sdcard_cali_flag = 88; }, 0, kCalibrated},
    {"cali_size_same", jvsdcali_handler, "AT+JVSDCALI=1", kCardDir, ERR, "", {kCalibrate}},
    {"cali_tool_failed", jvsdcali_handler, "AT+JVSDCALI=1", kCardDir, ERR, "", {kCalibrate}, {}, nullptr, nullptr, 1 << 8, kCalibrated},
    {"cali_tool_not_run", jvsdcali_handler, "AT+JVSDCALI=1", kCardDir, ERR, "", {kCalibrate}, {}, nullptr, nullptr, -1, kCalibrated},
};

INSTANTIATE_TEST_SUITE_P(Storage, HandlerTable, ::testing::ValuesIn(kRows), case_name);

using Tree = std::vector<std::string>;
class StorageTest : public DeviceRootTest {
 protected:
  void SetUp() override {
    DeviceRootTest::SetUp();
    fresh_card();
  }
  // An empty card. The keep lists outlive a run on purpose; `forget` empties them.
  void fresh_card(bool forget = true) {
    if (forget) clear_sdcard_keep = jvfn_keep = keep_list{};
    fs::remove_all(host_path(kCard));
    make_dir(kCard);
  }

  // Entries below the card: "dir/" a directory, "name -> target" a link (relative targets
  // only), "name|" a pipe, "name" a file.
  void populate(const Tree& tree) {
    for (const std::string& entry : tree) {
      const size_t arrow = entry.find(" -> ");
      const fs::path path = host_path(kCard + entry.substr(0, std::min(arrow, entry.find('|'))));
      fs::create_directories(entry.back() == '/' ? path : path.parent_path());
      if (arrow != std::string::npos)
        fs::create_symlink(entry.substr(arrow + 4), path);
      else if (entry.back() == '|')
        ASSERT_EQ(::mkfifo(path.c_str(), 0600), 0);
      else if (entry.back() != '/')
        write_file(kCard + entry, "data");
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

  // The card after AT+JVDF=1 (or clear_sdcard in `mode`) on a fresh card holding `before` and
  // the keep list `keep`. The targets outside the card that links point at stay untouched.
  Tree cleared(const std::string& keep, const Tree& before, const char* mode = nullptr, bool forget = true) {
    fresh_card(forget);
    write_file("/storage/sdcard1/p.jpg", "photo");
    write_file("/data/precious.txt", "keep");
    populate(before);
    write_file(kCfg, keep);
    EXPECT_EQ(mode ? clear_sdcard(mode) : call_handler(jvdf_handler, "AT+JVDF=1").status, mode ? 1 : RESULT_OK);
    EXPECT_EQ(read_file("/storage/sdcard1/p.jpg") + read_file("/data/precious.txt"), "photokeep");
    return card_tree();
  }
};

TEST_F(StorageTest, ClearLeavesExactlyTheKeepList) {
  EXPECT_EQ(cleared("f apps.zip\n", {"apps.zip", "a.txt", ".hidden", ".sdimg_check", "DCIM/1.jpg", "sub/apps.zip", "empty/"}),
            Tree{"apps.zip"});
  // A kept path inside a directory: the directory is cleaned rather than deleted.
  EXPECT_EQ(cleared("d DCIM/Camera\nf .clear_sdcard.cfg\n", {"DCIM/Camera/sub/2.jpg", "DCIM/other/3.jpg", "DCIM/x.jpg", "Music/a.mp3"}),
            (Tree{".clear_sdcard.cfg", "DCIM/", "DCIM/Camera/", "DCIM/Camera/sub/", "DCIM/Camera/sub/2.jpg"}));
  EXPECT_EQ(cleared("d DCIM/Camera\nd DCIM\n", {"DCIM/Camera/1.jpg", "DCIM/x.jpg"}),
            (Tree{"DCIM/", "DCIM/Camera/", "DCIM/Camera/1.jpg", "DCIM/x.jpg"}));
  // No separator check: DCIM2/x begins with DCIM.
  EXPECT_EQ(cleared("d DCIM2/x\n", {"DCIM/a.jpg", "DCIM2/x/b", "DCIM2/y"}), (Tree{"DCIM/", "DCIM2/", "DCIM2/x/", "DCIM2/x/b"}));
  EXPECT_EQ(cleared("d Music/keep\nf Music/song.mp3\n", {"Music/keep/a", "Music/song.mp3", "Music/other.mp3", "song.mp3"}),
            (Tree{"Music/", "Music/keep/", "Music/keep/a", "Music/song.mp3"}));
  EXPECT_EQ(cleared("# comment\n\nd:DCIM  \nf\tapps.zip \r\nx Music\nd\n", {"DCIM/a.jpg", "apps.zip", "Music/b.mp3"}),
            (Tree{"DCIM/", "DCIM/a.jpg", "apps.zip"}));
  EXPECT_EQ(cleared("f .sdimg_check\n", {".sdimg_check"}), Tree{});
  // Entries of other types stay, and so does the directory that holds them.
  EXPECT_EQ(cleared("", {"Trash/a.txt", "Trash/deep/b.txt", "Trash/pipe|", "c.txt"}), (Tree{"Trash/", "Trash/pipe"}));
  // Links are entries: removed, never descended, never kept as directories.
  EXPECT_EQ(cleared("d DCIM/Camera\nd Pics/keep\n", {"DCIM/Camera/1.jpg", "DCIM/lnk -> ../../sdcard1", "Trash/inner -> ../../sdcard1",
                                                     "Pics -> ../sdcard1", "top -> ../sdcard1", "abs -> /data", "dangling -> nowhere",
                                                     "DCIM/Camera/self -> ../Camera"}),
            (Tree{"DCIM/", "DCIM/Camera/", "DCIM/Camera/1.jpg", "DCIM/Camera/self -> ../Camera"}));
  EXPECT_EQ(cleared("f notes\n", {"notes -> ../sdcard1/p.jpg"}), Tree{"notes -> ../sdcard1/p.jpg"});
  EXPECT_EQ(cleared("f .clear_sdcard.cfg\nf a.txt\n", {"a.txt", "apps.zip", "Music/apps.zip"}, "update_app"),
            (Tree{".clear_sdcard.cfg", "a.txt", "apps.zip"}));
  // The lists are not emptied between runs: a shorter one overwrites the first entries only.
  EXPECT_EQ(cleared("f .clear_sdcard.cfg\nf a.txt\nf b.txt\n", {"a.txt"}), (Tree{".clear_sdcard.cfg", "a.txt"}));
  EXPECT_EQ(cleared("f .clear_sdcard.cfg\nf c.txt\n", {"a.txt", "b.txt", "c.txt", "d.txt"}, nullptr, false),
            (Tree{".clear_sdcard.cfg", "b.txt", "c.txt"}));
}

TEST_F(StorageTest, BadKeepListsAndTreesAreBounded) {
  // The tail of an over-long line must not become an entry of its own; full lists drop the rest.
  std::string keep = "d " + std::string(1021, 'y') + "f apps.zip\nf " + std::string(5000, 'z') + "\n";
  for (int i = 0; i < 250; ++i) keep += "f keep_" + std::to_string(i) + "\nd dir_" + std::to_string(i) + "\n";
  EXPECT_EQ(cleared(keep, {"apps.zip", "keep_0", "keep_199", "keep_200", "dir_0/", "dir_199/", "dir_200/"}),
            (Tree{"dir_0/", "dir_199/", "keep_0", "keep_199"}));
  // What fits the path limit goes; the rest stays.
  std::string deep = "Deep";
  for (int i = 0; i < 700; ++i) deep += "/d";
  const Tree after = cleared("", {deep + "/bottom.txt", "Deep/top.txt", "a.txt"});
  EXPECT_EQ(std::count(after.begin(), after.end(), deep + "/bottom.txt"), 1);
  EXPECT_EQ(std::count(after.begin(), after.end(), "Deep/top.txt") + std::count(after.begin(), after.end(), "a.txt"), 0);
}

// Kept entries are counted (links as files, never followed); any leftover fails the check.
TEST_F(StorageTest, CountsKeptEntriesAndJudgesLeftovers) {
  const Tree leftovers = {"", "oem_log.txt", "OEM_X", "DCIM/", "Camera", "相机/", "apps.zip",
                          "factory_test.amr", "krolog/", "mtklog", ".sdimg_check", "oem_dir/"};
  for (const std::string& leftover : leftovers) {
    fresh_card();
    write_file("/storage/sdcard1/outside/x", "x");
    write_file(kCfg, "d Music\nf readme.txt\nf .clear_sdcard.cfg\nd Music/sub\n");
    populate({"Music/a.mp3", "Music/sub/b.mp3", "Music/sub/deeper/", "Music/lnk -> ../readme.txt",
              "Music/out -> ../../sdcard1/outside", "readme.txt", "other.txt", "Pictures/p.jpg"});
    if (!leftover.empty()) populate({leftover});
    const HandlerAnswer answer = call_handler(jvfn_handler, "AT+JVFN=0");
    // Only a directory named oem_ is no leftover.
    EXPECT_EQ(answer.status, leftover.empty() || leftover == "oem_dir/" ? RESULT_OK : RESULT_ERROR) << leftover;
    // Directories: Music, sub, deeper. Files: a.mp3, b.mp3, two links, readme.txt, the list.
    EXPECT_EQ(answer.body, "\r\n\"3, 6\"\r\n") << leftover;
  }
}

// The card's size as statfs reports it, in gigabytes.
TEST_F(StorageTest, InternalStorageSize) {
  const std::string body = call_handler(jvudroom_handler, "AT+JVUDROOM=0").body;
  struct statfs st {};
  ASSERT_EQ(::statfs(host_path(kCard).c_str(), &st), 0);
  const double total = static_cast<double>(st.f_blocks) * st.f_bsize / (1 << 30);
  EXPECT_NEAR(std::strtod(body.c_str() + std::min<size_t>(body.size(), 3), nullptr), total, 0.006) << body;
}

}  // namespace
