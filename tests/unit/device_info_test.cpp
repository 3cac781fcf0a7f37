#include <gtest/gtest.h>

#include <string>
#include <utility>
#include <vector>

#include "commands/command_util.h"
#include "commands/device_info.h"
#include "core/command.h"
#include "tests/unit/device_root.h"
#include "tests/unit/handler_call.h"

namespace {

using Setup = std::vector<std::pair<std::string, std::string>>;

struct QueryCase {
  const char* name;
  CommandHandler handler;
  std::string line;
  Setup files;       // device path -> content
  Setup properties;  // name -> value
  int status;
  std::string body;
};
void PrintTo(const QueryCase& c, std::ostream* os) { *os << c.name; }

std::string quoted(const std::string& value) { return "\r\n\"" + value + "\"\r\n"; }

const std::string kMemInfo = "MemTotal:        3809436 kB\nMemFree:          912344 kB\n";
const std::string kCid = "150100523148414703a1b2c3d4e5f6a7";
const std::string kLong300(300, 'x');

std::vector<QueryCase> query_cases() {
  const int OK = RESULT_OK;
  const int ERR = RESULT_ERROR;
  const int BODY = RESULT_BODY_ONLY;
  return {
      // Memory size: only the first 10 characters of the line are compared.
      {"ram", jvram_handler, "AT+JVRAM=0", {{"/proc/meminfo", kMemInfo}}, {}, OK, quoted("3720")},
      {"ram_prefix", jvram_handler, "AT+JVRAM=0,9", {{"/proc/meminfo", kMemInfo}}, {}, OK, quoted("3720")},
      {"ram_lower_case", jvram_handler, "at+jvram=0", {{"/proc/meminfo", kMemInfo}}, {}, OK, quoted("3720")},
      {"ram_other_variant", jvram_handler, "AT+JVRAM=1", {{"/proc/meminfo", kMemInfo}}, {}, ERR, ""},
      {"ram_not_first", jvram_handler, "AT+JVRAM=0", {{"/proc/meminfo", "MemFree: 1 kB\nMemTotal: 2048 kB\n"}}, {}, ERR, ""},
      {"ram_no_size", jvram_handler, "AT+JVRAM=0", {{"/proc/meminfo", "MemTotal:\n"}}, {}, ERR, ""},
      // The size lies beyond the 49 characters of the line buffer.
      {"ram_size_past_buffer", jvram_handler, "AT+JVRAM=0", {{"/proc/meminfo", "MemTotal:" + std::string(45, ' ') + "3809436 kB\n"}}, {}, ERR, ""},
      {"ram_missing", jvram_handler, "AT+JVRAM=0", {}, {}, ERR, ""},

      {"model", jvmodel_handler, "AT+JVMODEL=0", {}, {{"ro.product.model", "QM0305A"}}, OK, quoted("QM0305A")},
      {"model_prefix", jvmodel_handler, "AT+JVMODEL=0 trailing", {}, {{"ro.product.model", "QM0305A"}}, OK, quoted("QM0305A")},
      {"model_unset", jvmodel_handler, "AT+JVMODEL=0", {}, {}, OK, quoted("")},

      // Flash size: a relative path, 512-byte sectors in gigabytes.
      {"flash", jvfq_handler, "AT+JVFQ=0", {{"sys/class/block/mmcblk0/size", "30535680\n"}}, {}, OK, quoted("14.56")},
      {"flash_trailing_blank", jvfq_handler, "AT+JVFQ=0 ", {{"sys/class/block/mmcblk0/size", "30535680\n"}}, {}, ERR, ""},
      {"flash_missing", jvfq_handler, "AT+JVFQ=0", {}, {}, ERR, ""},

      {"cid", jvrid_handler, "AT+JVRID=1", {{"/sys/block/mmcblk0/device/cid", kCid + "\n"}}, {}, OK, quoted(kCid)},
      {"cid_short", jvrid_handler, "AT+JVRID=1", {{"/sys/block/mmcblk0/device/cid", "abc\n"}}, {}, OK, quoted("abc\n")},
      {"cid_missing", jvrid_handler, "AT+JVRID=1", {}, {}, ERR, ""},

      {"cpuid_hex", jvcpuid_handler, "AT+JVCPUID=1", {{"/proc/sec_serial_num", "0x1a2b3c4d\n"}}, {}, OK, quoted("1a2b3c4d\n")},
      {"cpuid_plain", jvcpuid_handler, "AT+JVCPUID=1", {{"/proc/sec_serial_num", "DEADBEEF"}}, {}, OK, quoted("DEADBEEF")},
      {"cpuid_long", jvcpuid_handler, "AT+JVCPUID=1", {{"/proc/sec_serial_num", kLong300}}, {}, OK, quoted(kLong300.substr(0, 256))},
      {"cpuid_missing", jvcpuid_handler, "AT+JVCPUID=1", {}, {}, ERR, ""},

      {"seboot_fused", jvseboot_handler, "AT+JVSEBOOT=1", {{"/proc/sec_enable", "0x00303030"}}, {}, OK, ""},
      {"seboot_case", jvseboot_handler, "AT+JVSEBOOT=1", {{"/proc/sec_enable", "0X00303030"}}, {}, OK, ""},
      {"seboot_line_end", jvseboot_handler, "AT+JVSEBOOT=1", {{"/proc/sec_enable", "0x00303030\n"}}, {}, ERR, ""},
      {"seboot_missing", jvseboot_handler, "AT+JVSEBOOT=1", {}, {}, ERR, ""},

      // Processor variant: the loose tests follow the strict ones and still win over later ones.
      {"bb_ab", jvbbtype_handler, "AT+JVBBTYPE=0", {{"/sys/devs_list/mpps_value", "cpu--AB\n"}}, {}, OK, quoted("8974AB")},
      {"bb_aa_with_ab", jvbbtype_handler, "AT+JVBBTYPE=0", {{"/sys/devs_list/mpps_value", "cpu--AA AB\n"}}, {}, OK, quoted("8974AB")},
      {"bb_ac", jvbbtype_handler, "AT+JVBBTYPE=0", {{"/sys/devs_list/mpps_value", "cpu--AC\n"}}, {}, OK, quoted("8974AC")},
      {"bb_aa_before_26", jvbbtype_handler, "AT+JVBBTYPE=0", {{"/sys/devs_list/mpps_value", "cpu--26 AA\n"}}, {}, OK, quoted("8974AA")},
      {"bb_26", jvbbtype_handler, "AT+JVBBTYPE=0", {{"/sys/devs_list/mpps_value", "cpu--26\n"}}, {}, OK, quoted("8926")},
      {"bb_26_before_28", jvbbtype_handler, "AT+JVBBTYPE=0", {{"/sys/devs_list/mpps_value", "cpu--28 v26\n"}}, {}, OK, quoted("8926")},
      {"bb_28", jvbbtype_handler, "AT+JVBBTYPE=0", {{"/sys/devs_list/mpps_value", "cpu 28\n"}}, {}, OK, quoted("8928")},
      {"bb_16", jvbbtype_handler, "AT+JVBBTYPE=0", {{"/sys/devs_list/mpps_value", "cpu-16\n"}}, {}, OK, quoted("8916")},
      {"bb_16_two_dashes", jvbbtype_handler, "AT+JVBBTYPE=0", {{"/sys/devs_list/mpps_value", "cpu--16\n"}}, {}, ERR, ""},
      {"bb_no_cpu", jvbbtype_handler, "AT+JVBBTYPE=0", {{"/sys/devs_list/mpps_value", "AB\n"}}, {}, ERR, ""},
      {"bb_cpu_past_buffer", jvbbtype_handler, "AT+JVBBTYPE=0", {{"/sys/devs_list/mpps_value", std::string(130, ' ') + "cpu--AB\n"}}, {}, ERR, ""},
      {"bb_other", jvbbtype_handler, "AT+JVBBTYPE=1", {{"/sys/devs_list/mpps_value", "cpu--AB\n"}}, {}, ERR, ""},

      // Raw reads keep the line end; first lines are cut at CR or LF.
      {"mpps", jvmpps_handler, "AT+JVMPPS=0", {{"/sys/devs_list/mpps_value", "cpu--AB\n"}}, {}, OK, quoted("cpu--AB\n")},
      {"mpps_long", jvmpps_handler, "AT+JVMPPS=0", {{"/sys/devs_list/mpps_value", kLong300}}, {}, OK, quoted(kLong300.substr(0, 200))},
      {"lcm", jvlcmid_handler, "AT+JVLCMID=0", {{"/sys/lcm/lcm_id", "nt35596_tianma\nsecond\n"}}, {}, OK, quoted("nt35596_tianma")},
      {"lcm_crlf", jvlcmid_handler, "AT+JVLCMID=0", {{"/sys/lcm/lcm_id", "r63315\r\n"}}, {}, OK, quoted("r63315")},
      {"lcm_long", jvlcmid_handler, "AT+JVLCMID=0", {{"/sys/lcm/lcm_id", kLong300}}, {}, OK, quoted(kLong300.substr(0, 49))},
      {"lcm_empty", jvlcmid_handler, "AT+JVLCMID=0", {{"/sys/lcm/lcm_id", ""}}, {}, ERR, ""},
      {"pid", jvpid_handler, "AT+JVPID=0", {{"/sys/touchscreen/firmware_module_id", "0x3b\n"}}, {}, OK, quoted("0x3b")},
      {"ckic", jvckic_handler, "AT+JVCKIC=0", {{"/sys/touchscreen/touchpanel_devices", "synaptics_s3320\n"}}, {}, OK, quoted("synaptics_")},
      {"ccmid", jvccmid_handler, "AT+JVCCMID=0", {{"sys/ccm/FrontSensorId", "ov5670\n"}, {"sys/ccm/RearSensorId", "imx214\n"}}, {}, OK, "\r\n\"front:ov5670\r\nback:imx214\"\r\n "},
      {"ccmid_no_rear", jvccmid_handler, "AT+JVCCMID=0", {{"sys/ccm/FrontSensorId", "ov5670\n"}}, {}, ERR, ""},

      // Touch firmware version: unframed, a bare LF at the end.
      {"twst", jvtwst_handler, "AT+JVTWST=0", {{"/sys/touchscreen/firmware_version", "0x1a\n"}}, {{"ro.build.version.kro", "V1.0.3"}}, OK, "\"V1.0.3_0x1a\"\n"},
      {"twst_cut_at_10", jvtwst_handler, "AT+JVTWST=0", {{"/sys/touchscreen/firmware_version", "0123456789ABC"}}, {{"ro.build.version.kro", "V1"}}, OK, "\"V1_0123456789\"\n"},
      {"twst_no_build", jvtwst_handler, "AT+JVTWST=0", {{"/sys/touchscreen/firmware_version", "0x1a\n"}}, {}, ERR, ""},
      {"twst_too_long", jvtwst_handler, "AT+JVTWST=0", {{"/sys/touchscreen/firmware_version", "0123456789"}}, {{"ro.build.version.kro", std::string(90, 'v')}}, ERR, ""},
      {"twst_no_file", jvtwst_handler, "AT+JVTWST=0", {}, {{"ro.build.version.kro", "V1"}}, ERR, ""},

      // Battery identity: zero passes.
      {"dcid_zero", jvdcid_handler, "AT+JVDCID=1", {{"/sys/class/power_supply/cms/power_avg", "0\n"}}, {}, OK, ""},
      {"dcid_1a", jvdcid_handler, "AT+JVDCID=1", {{"/sys/class/power_supply/cms/power_avg", "1a\n"}}, {}, ERR, ""},
      {"dcid_high_bits", jvdcid_handler, "AT+JVDCID=1", {{"/sys/class/power_supply/cms/power_avg", "0x100000000"}}, {}, OK, ""},

      {"usb2", jvusb_handler, "AT+JVUSB=0", {{"sys/class/power_supply/usb/power_now", "3\n"}}, {}, OK, quoted("2")},
      {"usb3", jvusb_handler, "AT+JVUSB=0", {{"sys/class/power_supply/usb/power_now", "5\n"}}, {}, OK, quoted("3")},
      {"usb_other", jvusb_handler, "AT+JVUSB=0", {{"sys/class/power_supply/usb/power_now", "4\n"}}, {}, OK, quoted("0")},

      // SIM presence: positional slots, case-sensitive states.
      {"sim1_ready", jvsim_handler, "AT+JVSIM=1", {}, {{"gsm.sim.state", "READY"}}, OK, ""},
      {"sim1_absent", jvsim_handler, "AT+JVSIM=1", {}, {{"gsm.sim.state", "ABSENT"}}, ERR, ""},
      {"sim1_lower", jvsim_handler, "AT+JVSIM=1", {}, {{"gsm.sim.state", "ready"}}, ERR, ""},
      {"sim1_dual", jvsim_handler, "AT+JVSIM=1", {}, {{"gsm.sim.state", "READY,ABSENT"}}, OK, ""},
      {"sim2_dual_absent", jvsim_handler, "AT+JVSIM=2", {}, {{"gsm.sim.state", "READY,ABSENT"}}, ERR, ""},
      {"sim2_dual", jvsim_handler, "AT+JVSIM=2", {}, {{"gsm.sim.state", "ABSENT,PIN_REQUIRED"}}, OK, ""},
      {"sim1_empty_slot", jvsim_handler, "AT+JVSIM=1", {}, {{"gsm.sim.state", ",READY"}}, ERR, ""},
      {"sim2_own_property", jvsim_handler, "AT+JVSIM=2", {}, {{"gsm.sim.state", "READY"}, {"gsm.sim.state.2", "NOT_READY"}}, OK, ""},
      {"sim2_unset", jvsim_handler, "AT+JVSIM=2", {}, {}, ERR, ""},
      {"sim_other", jvsim_handler, "AT+JVSIM=3", {}, {{"gsm.sim.state", "READY"}}, ERR, ""},

      {"cards_sim1", jvcard_handler, "AT+JVCARD=1", {}, {{"gsm.sim.state", "READY,ABSENT"}}, OK, "+cards:\"SIM1\",\"\",\"\""},
      {"cards_both_and_tf", jvcard_handler, "AT+JVCARD=1", {{"/storage/sdcard1/.keep", ""}}, {{"gsm.sim.state", "READY"}, {"gsm.sim.state.2", "PIN_REQUIRED"}}, OK, "+cards:\"SIM1\",\"SIM2\",\"TF\""},
      {"cards_none", jvcard_handler, "AT+JVCARD=1", {}, {}, OK, "+cards:\"\",\"\",\"\""},
      {"cards_other_line", jvcard_handler, "AT+JVCARD=0", {}, {{"gsm.sim.state", "READY"}}, OK, ""},

      // Card slot mechanics: body only, each line framed by CR LF pairs.
      {"ts_inserted", jvts_handler, "AT+JVTS=1", {{"/sys/devs_list/card_slot_inserted_check", "sim1:1\ntf:0\n"}}, {}, BODY, "\r\nsim1:1\n\r\n\r\ntf:0\n\r\n"},
      {"ts_removed", jvts_handler, "AT+JVTS=0", {{"/sys/devs_list/card_slot_removed_check", "ok"}}, {}, BODY, "\r\nok\r\n"},
      {"ts_empty", jvts_handler, "AT+JVTS=1", {{"/sys/devs_list/card_slot_inserted_check", ""}}, {}, BODY, ""},
      {"ts_missing", jvts_handler, "AT+JVTS=1", {}, {}, ERR, ""},
      {"ts_other", jvts_handler, "AT+JVTS=2", {{"/sys/devs_list/card_slot_inserted_check", "x\n"}}, {}, ERR, ""},

      {"hall_no_magnet", jvhall_handler, "AT+JVHALL=1", {{"/sys/class/switch/hall/state", "1\n"}}, {}, ERR, ""},
      {"hall_magnet", jvhall_handler, "AT+JVHALL=1", {{"/sys/class/switch/hall/state", "0\n"}}, {}, OK, ""},

      {"fp_board_ok", jvzwsb_handler, "AT+JVZWSB=0", {{"/.emu/factory/check_board", "0\n"}}, {}, OK, ""},
      {"fp_board_bad", jvzwsb_handler, "AT+JVZWSB=0", {{"/.emu/factory/check_board", "1\n"}}, {}, ERR, ""},
      {"fp_quality", jvzwsb_handler, "AT+JVZWSB=1", {}, {}, ERR, ""},
      {"fp_vendor", jvzwsb_handler, "AT+JVZWSB=2", {}, {}, OK, quoted("fpc")},

      {"camera_both", jvccm_handler, "AT+JVCCM=1", {{"/.emu/camera", "3\n"}}, {}, OK, ""},
      {"camera_more_bits", jvccm_handler, "AT+JVCCM=1", {{"/.emu/camera", "7\n"}}, {}, OK, ""},
      {"camera_rear_only", jvccm_handler, "AT+JVCCM=1", {{"/.emu/camera", "1\n"}}, {}, ERR, ""},

      {"zsj", jvzsj_iicrc_handler, "AT+JVZSJ=1", {}, {}, RESULT_NOT_IMPLEMENTED, ""},
      {"iicrc", jvzsj_iicrc_handler, "AT+JVIICRC=0", {}, {}, RESULT_NOT_IMPLEMENTED, ""},
  };
}

class DeviceInfoQuery : public DeviceRootTest, public ::testing::WithParamInterface<QueryCase> {};

TEST_P(DeviceInfoQuery, AnswersExactly) {
  const QueryCase& c = GetParam();
  for (const auto& [path, content] : c.files) write_file(path, content);
  for (const auto& [name, value] : c.properties) set_property(name, value);
  const HandlerAnswer answer = call_handler(c.handler, c.line);
  EXPECT_EQ(answer.status, c.status);
  EXPECT_EQ(answer.body, c.body);
}

INSTANTIATE_TEST_SUITE_P(Cases, DeviceInfoQuery, ::testing::ValuesIn(query_cases()),
                         [](const auto& info) { return std::string(info.param.name); });

class DeviceInfo : public DeviceRootTest {};

TEST_F(DeviceInfo, ProductModelIsComparedWholeAndReadEveryTime) {
  set_property("ro.pemu.product.model", "QM0305A");
  EXPECT_EQ(is_product_model("QM0305A"), 1);
  EXPECT_EQ(is_product_model("QM0305"), 0);
  EXPECT_EQ(is_product_model("qm0305a"), 0);
  EXPECT_EQ(is_product_model(""), 0);
  write_file("/dev/__properties__/ro.pemu.product.model", "QM0202A");
  EXPECT_EQ(is_product_model("QM0202A"), 1);
}

TEST_F(DeviceInfo, ImageQualityRequestIsBroadcast) {
  ASSERT_EQ(call_handler(jvzwsb_handler, "AT+JVZWSB=1").status, RESULT_ERROR);
  ASSERT_EQ(shell_commands().size(), 1u);
  EXPECT_NE(shell_commands()[0].find("android.intent.action.FP_IMAGE_QUALITY"), std::string::npos)
      << shell_commands()[0];
}

TEST_F(DeviceInfo, ManySlotLinesStayWithinTheBody) {
  std::string lines;
  for (int i = 0; i < 5000; ++i) lines += "slot" + std::to_string(i) + ":1\n";
  write_file("/sys/devs_list/card_slot_inserted_check", lines);
  const HandlerAnswer answer = call_handler(jvts_handler, "AT+JVTS=1");
  EXPECT_EQ(answer.status, RESULT_BODY_ONLY);
  EXPECT_LE(answer.body.size(), BODY_LIMIT);
  EXPECT_EQ(answer.body.rfind("\r\nslot0:1\n\r\n", 0), 0u);
  EXPECT_EQ(answer.body.substr(answer.body.size() - 2), "\r\n");  // only whole lines
}

}  // namespace
