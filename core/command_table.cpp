// The daemon's whole vocabulary, searched linearly in this order.
#include "core/command.h"

#include "commands/amplifier.h"
#include "commands/audio_path.h"
#include "commands/clock_language.h"
#include "commands/device_info.h"
#include "commands/factory_flags.h"
#include "commands/file_transfer.h"
#include "commands/identity.h"
#include "commands/operator.h"
#include "commands/power_reset.h"
#include "commands/storage.h"
#include "commands/usb_adb.h"

namespace {
constexpr int32_t kSetOrAction = OP_SET | OP_ACTION;
}  // namespace

constinit const CommandEntry command_table[COMMAND_COUNT] = {
    {"AT+JVCN", kSetOrAction, jvcn_handler},
    {"AT+ETST", kSetOrAction, unspecified_command_handler},  // not specified further
    {"AT+JVSJ", kSetOrAction, get_system_time_handler},
    {"AT+JVMMIUI", kSetOrAction, jvmmiui_handler},
    {"AT+JVSP", kSetOrAction, pending_family_handler},
    {"AT+JVBS", kSetOrAction, pending_family_handler},
    {"AT+LCMT", kSetOrAction, pending_family_handler},
    {"AT+OFFL", kSetOrAction, pending_family_handler},
    {"AT+EQSB", kSetOrAction, pending_family_handler},
    {"AT+TFST", kSetOrAction, tfst_handler},
    {"AT+JVROOT", kSetOrAction, jvroot_handler},
    {"AT+JVXL", kSetOrAction, play_ring_handler},
    {"AT+ESLP", kSetOrAction, pending_family_handler},
    {"AT+JVKJ", kSetOrAction, jvkj_handler},
    {"AT+JVDL", kSetOrAction, jvdl_handler},
    {"AT+JVIQ", kSetOrAction, unspecified_command_handler},  // not specified further
    {"AT+EDFT", kSetOrAction, pending_family_handler},
    {"AT+JVTWST", kSetOrAction, jvtwst_handler},
    {"AT+JVSIM", kSetOrAction, jvsim_handler},
    {"AT+JVSD", kSetOrAction, jvsd_handler},
    {"AT+JVMP", kSetOrAction, play_media_handler},
    {"AT+JVTR", kSetOrAction, unspecified_command_handler},  // not specified further
    {"AT+JVNC", kSetOrAction, jvnc_handler},
    {"AT+JVDLJ", kSetOrAction, pending_family_handler},
    {"AT+JVTFWR", kSetOrAction, jvtfwr_handler},
    {"AT+JVOTG", kSetOrAction, jvotg_handler},
    {"AT+JVUDWR", kSetOrAction, jvudwr_handler},
    {"AT+JVUDROOM", kSetOrAction, jvudroom_handler},
    {"AT+JVRDNV", kSetOrAction, jvrdnv_handler},
    {"AT+JVMD", kSetOrAction, ring_test_handler},
    {"AT+JVCHARGE", kSetOrAction, pending_family_handler},
    {"AT+JVCHARG", kSetOrAction, pending_family_handler},
    {"AT+RMCHARGEP", kSetOrAction, pending_family_handler},
    {"AT+OMENU", kSetOrAction, omenu_handler},
    {"AT+JVADB", kSetOrAction, jvadb_handler},
    {"AT+JVDIAG", kSetOrAction, jvdiag_handler},
    {"AT+JVFQ", kSetOrAction, jvfq_handler},
    {"AT+JVHALL", kSetOrAction, jvhall_handler},
    {"AT+JVTESTMMI", kSetOrAction, jvtestmmi_handler},
    {"AT+JV3G", kSetOrAction, jv3g_handler},
    {"AT+JVOPTR", kSetOrAction, optr_flag_handler},
    {"AT+JVUPDATE", kSetOrAction, jvupdate_handler},
    {"AT+JVOEM", kSetOrAction, check_oem_handler},
    {"AT+JVMODEL", kSetOrAction, jvmodel_handler},
    {"AT+JVLCD", kSetOrAction, pending_family_handler},
    {"AT+JVAPP", kSetOrAction, unspecified_command_handler},  // not specified further
    {"AT+JVG3G", kSetOrAction, jvg3g_handler},
    {"AT+JVSB3G", kSetOrAction, pending_family_handler},
    {"AT+JVSBDT", kSetOrAction, pending_family_handler},
    {"AT+JVSDCALI", kSetOrAction, jvsdcali_handler},
    {"AT+JVUSB", kSetOrAction, jvusb_handler},
    {"AT+JVSJZLB", kSetOrAction, unspecified_command_handler},  // not specified further
    {"AT+JVQXGWBH", kSetOrAction, pending_family_handler},
    {"AT+JVNFC", kSetOrAction, pending_family_handler},
    {"AT+JVRID", kSetOrAction, jvrid_handler},
    {"AT+JVSWXFK", kSetOrAction, pending_family_handler},
    {"AT+JVLCMID", kSetOrAction, jvlcmid_handler},
    {"AT+JVCCMID", kSetOrAction, jvccmid_handler},
    {"AT+JVPID", kSetOrAction, jvpid_handler},
    {"AT+JVRAM", kSetOrAction, jvram_handler},
    {"AT+JVRADIO", kSetOrAction, pending_family_handler},
    {"AT+JVCKIC", kSetOrAction, jvckic_handler},
    {"AT+JVBBTYPE", kSetOrAction, jvbbtype_handler},
    {"AT+JVRTALL", kSetOrAction, jvrtall_handler},
    {"AT+JVLOG", kSetOrAction, jvlog_handler},
    {"AT+MMICCM", kSetOrAction, pending_family_handler},
    {"AT+MMITW", kSetOrAction, pending_family_handler},
    {"AT+JVSFT", kSetOrAction, pending_family_handler},
    {"AT+JVDF", kSetOrAction, jvdf_handler},
    {"AT+JVFN", kSetOrAction, jvfn_handler},
    {"AT+ZNGF", kSetOrAction, smart_speaker_Amplifier_calibrate_handler},
    {"AT+JVSYJM", kSetOrAction, jvsyjm_handler},
    {"AT+JVSSID", kSetOrAction, unspecified_command_handler},  // not specified further
    {"AT+JVSEBOOT", kSetOrAction, jvseboot_handler},
    {"AT+JVCPUID", kSetOrAction, jvcpuid_handler},
    {"AT+JVDCID", kSetOrAction, jvdcid_handler},
    {"AT+JVCARD", kSetOrAction, jvcard_handler},
    {"AT+JVGMQH", kSetOrAction, unspecified_command_handler},  // not specified further
    {"AT+UPDATEAPPS", kSetOrAction, unspecified_command_handler},  // not specified further
    {"AT+JVLC", kSetOrAction, set_language_handler},
    {"AT+JVRIC", kSetOrAction, unspecified_command_handler},  // not specified further
    {"AT+SGDJZ", kSetOrAction, pending_family_handler},
    {"AT+JVCCM", kSetOrAction, jvccm_handler},
    {"AT+ONLINE", kSetOrAction, unspecified_command_handler},  // not specified further
    {"AT+JVLANGUAGE", kSetOrAction, set_default_language_handler},
    {"AT+JVFLIGHT", kSetOrAction, pending_family_handler},
    {"AT+JVFEATURE", kSetOrAction, jvfeature_handler},
    {"AT+JVZSJ", kSetOrAction, jvzsj_iicrc_handler},  // not specified further
    {"AT+JVIICRC", kSetOrAction, jvzsj_iicrc_handler},  // not specified further
    {"AT+JVAUDIO", kSetOrAction, i2c_device_test_handler},
    {"AT+JVZWSB", kSetOrAction, jvzwsb_handler},
    {"AT+PEMUKP", kSetOrAction, RSA_key_handler},
    {"AT+JVCONNWIFI", kSetOrAction, pending_family_handler},
    {"AT+JVDW", kSetOrAction, pending_family_handler},
    {"AT+JVSCAN", kSetOrAction, unspecified_command_handler},  // not specified further
    {"AT+JVLIFE", kSetOrAction, unspecified_command_handler},  // not specified further
    {"AT+JVPROP", kSetOrAction, property_set_handler},
    {"AT+JVSIMT", kSetOrAction, pending_family_handler},
    {"AT+JVTS", kSetOrAction, jvts_handler},
    {"AT+EADC", kSetOrAction, pending_family_handler},
    {"AT+EALT", kSetOrAction, mic_echo_handler},
    {"AT+EGMR", kSetOrAction, imei_and_pcb_code_on_handler},
    {"AT+EMBT", kSetOrAction, pending_family_handler},
    {"AT+JVWLAN", kSetOrAction, pending_family_handler},
    {"AT+JVGPS", kSetOrAction, pending_family_handler},
    {"AT+JVWMAC", kSetOrAction, pending_family_handler},
    {"AT+JVZLJC", kSetOrAction, pending_family_handler},
    {"AT+JVDZLP", kSetOrAction, pending_family_handler},
    {"AT+JVHWKJ", kSetOrAction, pending_family_handler},
    {"AT+JVGM", kSetOrAction, pending_family_handler},
    {"AT+JVTLY", kSetOrAction, pending_family_handler},
    {"AT+JVFM", kSetOrAction, pending_family_handler},
    {"AT+JVGJ", kSetOrAction, jvgj_handler},
    {"AT+JVREBOOT", kSetOrAction, jvreboot_handler},
    {"AT+JVRT", kSetOrAction, jvrt_handler},
    {"AT+JVSG", kSetOrAction, pending_family_handler},
    {"AT+MMILED", kSetOrAction, pending_family_handler},
    {"AT+JVCOM", kSetOrAction, jvcom_handler},
    {"AT+JVMT", kSetOrAction, echo_handler},
    {"AT+JVTDNV", kSetOrAction, nv_66024_handler},
    {"AT+JVLOGAT", kSetOrAction, jvlogat_handler},
    {"AT+JVQHZS", kSetOrAction, jvqhzs_handler},
    {"AT+JVLIGHT", kSetOrAction, pending_family_handler},
    {"AT+JVQLOG", kSetOrAction, jvqlog_handler},
    {"AT+JVMTE", kSetOrAction, dual_mic_to_headset_handler},
    {"AT+JVMTER", kSetOrAction, main_mic_to_headset_right_handler},
    {"AT+JVVMTEL", kSetOrAction, sub_mic_to_headset_left_handler},
    {"AT+JVEMTS", kSetOrAction, headset_to_speaker_handler},
    {"AT+JVEMTR", kSetOrAction, headset_to_earpiece_handler},
    {"AT+JVEMTSR", kSetOrAction, headset_to_right_speaker_handler},
    {"AT+JVEMTSL", kSetOrAction, headset_to_left_speaker_handler},
    {"AT+JVEMTSA", kSetOrAction, headset_to_speaker_with_gain_handler},
    {"AT+JVEMTRA", kSetOrAction, headset_to_earpiece_with_gain_handler},
    {"AT+JVDISRECHARGE", kSetOrAction, pending_family_handler},
    {"AT+JVZFTX", kSetOrAction, pending_family_handler},
    {"AT+JVMEID", kSetOrAction, pending_family_handler},
    {"AT+JVMPPS", kSetOrAction, jvmpps_handler},
    {"AT+JVDLJCS", kSetOrAction, pending_family_handler},
    {"AT+JVSYS", kSetOrAction, change_sig_system_handler},
    {"AT+JVEFS", kSetOrAction, jvefs_handler},
    {"AT+JVVSIM", kSetOrAction, pending_family_handler},
    {"AT+JVDPDT", kSetOrAction, pending_family_handler},
    {"AT+JVFILE", kSetOrAction, jvfile_handler},
    {"AT+JVKTV", kSetOrAction, ktv_test_handler},
};

int pending_family_handler(char*, int, char*) { return RESULT_NOT_IMPLEMENTED; }

// These provisioning commands have a row but no behaviour of their own: "Not Implement".
int unspecified_command_handler(char*, int, char*) { return RESULT_NOT_IMPLEMENTED; }
