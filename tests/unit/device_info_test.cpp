#include "commands/command_util.h"
#include "commands/device_info.h"

#include "tests/unit/handler_case.h"

namespace {

constexpr int OK = RESULT_OK;
constexpr int ERR = RESULT_ERROR;
constexpr int BODY = RESULT_BODY_ONLY;

std::string quoted(const std::string& value) { return "\r\n\"" + value + "\"\r\n"; }
std::string times(size_t n, const std::string& text) { return n == 0 ? "" : text + times(n - 1, text); }
Pairs file(const std::string& path, const std::string& content, Pairs more = {}) {
  more.push_back({path, content});
  return more;
}

const std::string kMemInfo = "MemTotal:        3809436 kB\nMemFree:          912344 kB\n";
const std::string kCid = "150100523148414703a1b2c3d4e5f6a7";
const std::string kLong(300, 'x');
const std::string kMpps = "/sys/devs_list/mpps_value";
const std::string kLcm = "/sys/lcm/lcm_id";
const std::string kTouch = "/sys/touchscreen/firmware_version";
const std::string kBatteryId = "/sys/class/power_supply/cms/power_avg";
const std::string kUsb = "sys/class/power_supply/usb/power_now";
const std::string kInserted = "/sys/devs_list/card_slot_inserted_check";
Pairs sim(const std::string& one, const std::string& two = "ABSENT") {
  return {{"prop:gsm.sim.state", one}, {"prop:gsm.sim.state.2", two}};
}

const HandlerCase kRows[] = {
    // Memory size: only the first 10 characters of the line count.
    {"ram_prefix", jvram_handler, "AT+JVRAM=0,9", file("/proc/meminfo", kMemInfo), OK, quoted("3720")},
    {"ram_near_miss", jvram_handler, "AT+JVRAM=1", file("/proc/meminfo", kMemInfo), ERR, ""},
    {"ram_not_first", jvram_handler, "AT+JVRAM=0", file("/proc/meminfo", "MemFree: 1 kB\nMemTotal: 2048 kB\n"), ERR, ""},
    // The size lies beyond the 49 characters of the line buffer.
    {"ram_size_past_buffer", jvram_handler, "AT+JVRAM=0", file("/proc/meminfo", "MemTotal:" + std::string(45, ' ') + "3809436 kB\n"), ERR, ""},
    {"model_prefix", jvmodel_handler, "AT+JVMODEL=0 trailing", {{"prop:ro.product.model", "QM0305A"}}, OK, quoted("QM0305A")},
    // Flash size: a relative path, 512-byte sectors in gigabytes; the line is compared whole.
    {"flash", jvfq_handler, "AT+JVFQ=0", file("sys/class/block/mmcblk0/size", "30535680\n"), OK, quoted("14.56")},
    {"flash_trailing_blank", jvfq_handler, "AT+JVFQ=0 ", file("sys/class/block/mmcblk0/size", "30535680\n"), ERR, ""},
    {"cid", jvrid_handler, "AT+JVRID=1", file("/sys/block/mmcblk0/device/cid", kCid + "\n"), OK, quoted(kCid)},
    {"cpuid_hex", jvcpuid_handler, "AT+JVCPUID=1", file("/proc/sec_serial_num", "0x1a2b3c4d\n"), OK, quoted("1a2b3c4d\n")},
    {"cpuid_long", jvcpuid_handler, "AT+JVCPUID=1", file("/proc/sec_serial_num", kLong), OK, quoted(kLong.substr(0, 256))},
    {"seboot_case", jvseboot_handler, "AT+JVSEBOOT=1", file("/proc/sec_enable", "0X00303030"), OK, ""},
    {"seboot_line_end", jvseboot_handler, "AT+JVSEBOOT=1", file("/proc/sec_enable", "0x00303030\n"), ERR, ""},
    // Processor variant: the loose tests follow the strict ones and still win over later ones.
    {"bb_ab_before_aa", jvbbtype_handler, "AT+JVBBTYPE=0", file(kMpps, "cpu--AA AB\n"), OK, quoted("8974AB")},
    {"bb_ac_before_aa", jvbbtype_handler, "AT+JVBBTYPE=0", file(kMpps, "cpu--AC AA\n"), OK, quoted("8974AC")},
    {"bb_aa_before_26", jvbbtype_handler, "AT+JVBBTYPE=0", file(kMpps, "cpu--26 AA\n"), OK, quoted("8974AA")},
    {"bb_26_before_28", jvbbtype_handler, "AT+JVBBTYPE=0", file(kMpps, "cpu--28 v26\n"), OK, quoted("8926")},
    {"bb_28", jvbbtype_handler, "AT+JVBBTYPE=0", file(kMpps, "cpu 28\n"), OK, quoted("8928")},
    {"bb_16", jvbbtype_handler, "AT+JVBBTYPE=0", file(kMpps, "cpu-16\n"), OK, quoted("8916")},
    {"bb_16_two_dashes", jvbbtype_handler, "AT+JVBBTYPE=0", file(kMpps, "cpu--16\n"), ERR, ""},
    {"bb_no_cpu", jvbbtype_handler, "AT+JVBBTYPE=0", file(kMpps, "AB\n"), ERR, ""},
    {"bb_cpu_past_buffer", jvbbtype_handler, "AT+JVBBTYPE=0", file(kMpps, std::string(130, ' ') + "cpu--AB\n"), ERR, ""},
    // Raw reads keep the line end; first lines are cut at CR or LF.
    {"mpps", jvmpps_handler, "AT+JVMPPS=0", file(kMpps, "cpu--AB\n"), OK, quoted("cpu--AB\n")},
    {"mpps_long", jvmpps_handler, "AT+JVMPPS=0", file(kMpps, kLong), OK, quoted(kLong.substr(0, 200))},
    {"lcm", jvlcmid_handler, "AT+JVLCMID=0", file(kLcm, "nt35596_tianma\nsecond\n"), OK, quoted("nt35596_tianma")},
    {"lcm_crlf", jvlcmid_handler, "AT+JVLCMID=0", file(kLcm, "r63315\r\n"), OK, quoted("r63315")},
    {"lcm_long", jvlcmid_handler, "AT+JVLCMID=0", file(kLcm, kLong), OK, quoted(kLong.substr(0, 49))},
    {"ckic", jvckic_handler, "AT+JVCKIC=0", file("/sys/touchscreen/touchpanel_devices", "synaptics_s3320\n"), OK, quoted("synaptics_")},
    {"ccmid", jvccmid_handler, "AT+JVCCMID=0", {{"sys/ccm/FrontSensorId", "ov5670\n"}, {"sys/ccm/RearSensorId", "imx214\n"}}, OK, "\r\n\"front:ov5670\r\nback:imx214\"\r\n "},
    {"ccmid_no_rear", jvccmid_handler, "AT+JVCCMID=0", file("sys/ccm/FrontSensorId", "ov5670\n"), ERR, ""},
    // Touch firmware version: unframed, a bare LF at the end; a cut answer is refused.
    {"twst", jvtwst_handler, "AT+JVTWST=0", file(kTouch, "0x1a\n", {{"prop:ro.build.version.kro", "V1.0.3"}}), OK, "\"V1.0.3_0x1a\"\n"},
    {"twst_cut_at_10", jvtwst_handler, "AT+JVTWST=0", file(kTouch, "0123456789ABC", {{"prop:ro.build.version.kro", "V1"}}), OK, "\"V1_0123456789\"\n"},
    {"twst_no_build", jvtwst_handler, "AT+JVTWST=0", file(kTouch, "0x1a\n"), ERR, ""},
    {"twst_too_long", jvtwst_handler, "AT+JVTWST=0", file(kTouch, "0123456789", {{"prop:ro.build.version.kro", std::string(90, 'v')}}), ERR, ""},
    // Battery identity: zero passes, judged on the low 32 bits.
    {"dcid_1a", jvdcid_handler, "AT+JVDCID=1", file(kBatteryId, "1a\n"), ERR, ""},
    {"dcid_high_bits", jvdcid_handler, "AT+JVDCID=1", file(kBatteryId, "0x100000000"), OK, ""},
    {"usb2", jvusb_handler, "AT+JVUSB=0", file(kUsb, "3\n"), OK, quoted("2")},
    {"usb3", jvusb_handler, "AT+JVUSB=0", file(kUsb, "5\n"), OK, quoted("3")},
    {"usb_other", jvusb_handler, "AT+JVUSB=0", file(kUsb, "4\n"), OK, quoted("0")},
    // SIM presence: positional slots, case-sensitive states.
    {"sim1_ready", jvsim_handler, "AT+JVSIM=1", sim("READY"), OK, ""},
    {"sim1_lower", jvsim_handler, "AT+JVSIM=1", sim("ready"), ERR, ""},
    {"sim1_dual", jvsim_handler, "AT+JVSIM=1", sim("READY,ABSENT"), OK, ""},
    {"sim2_dual", jvsim_handler, "AT+JVSIM=2", sim("ABSENT,PIN_REQUIRED"), OK, ""},
    {"sim1_empty_slot", jvsim_handler, "AT+JVSIM=1", sim(",READY"), ERR, ""},
    {"sim2_own_property", jvsim_handler, "AT+JVSIM=2", sim("READY", "NOT_READY"), OK, ""},
    {"cards_sim1", jvcard_handler, "AT+JVCARD=1", sim("READY,ABSENT"), OK, "+cards:\"SIM1\",\"\",\"\""},
    {"cards_both_and_tf", jvcard_handler, "AT+JVCARD=1", file("/storage/sdcard1/.keep", "", sim("READY", "PIN_REQUIRED")), OK, "+cards:\"SIM1\",\"SIM2\",\"TF\""},
    {"cards_other_line", jvcard_handler, "AT+JVCARD=0", sim("READY"), OK, ""},
    // Card slot mechanics: body only, each line framed by CR LF pairs.
    {"ts_inserted", jvts_handler, "AT+JVTS=1", file(kInserted, "sim1:1\ntf:0\n"), BODY, "\r\nsim1:1\n\r\n\r\ntf:0\n\r\n"},
    {"ts_removed", jvts_handler, "AT+JVTS=0", file("/sys/devs_list/card_slot_removed_check", "ok"), BODY, "\r\nok\r\n"},
    {"ts_empty", jvts_handler, "AT+JVTS=1", file(kInserted, ""), BODY, ""},
    {"ts_missing", jvts_handler, "AT+JVTS=1", {}, ERR, ""},
    // A long file: whole lines only, as many as the body holds.
    {"ts_long", jvts_handler, "AT+JVTS=1", file(kInserted, times(500, "sim1:1\n")), BODY, times(BODY_LIMIT / 11, "\r\nsim1:1\n\r\n")},
    {"hall_no_magnet", jvhall_handler, "AT+JVHALL=1", file("/sys/class/switch/hall/state", "1\n"), ERR, ""},
    {"hall_magnet", jvhall_handler, "AT+JVHALL=1", file("/sys/class/switch/hall/state", "0\n"), OK, ""},
    {"fp_board_ok", jvzwsb_handler, "AT+JVZWSB=0", file("/.emu/factory/check_board", "0\n"), OK, ""},
    {"fp_board_bad", jvzwsb_handler, "AT+JVZWSB=0", file("/.emu/factory/check_board", "1\n"), ERR, ""},
    {"fp_quality", jvzwsb_handler, "AT+JVZWSB=1", {}, ERR, "", {"am broadcast -a android.intent.action.FP_IMAGE_QUALITY"}},
    {"camera_both", jvccm_handler, "AT+JVCCM=1", file("/.emu/camera", "3\n"), OK, ""},
    {"camera_more_bits", jvccm_handler, "AT+JVCCM=1", file("/.emu/camera", "7\n"), OK, ""},
    {"camera_rear_only", jvccm_handler, "AT+JVCCM=1", file("/.emu/camera", "1\n"), ERR, ""},
};

INSTANTIATE_TEST_SUITE_P(DeviceInfo, HandlerTable, ::testing::ValuesIn(kRows), case_name);

}  // namespace
