// The daemon's whole vocabulary, searched linearly in this order.
#include "core/command.h"

#include "commands/amplifier.h"
#include "commands/audio_path.h"
#include "commands/clock_language.h"
#include "commands/device_info.h"
#include "commands/identity.h"
#include "commands/operator.h"
#include "commands/storage.h"

namespace {
constexpr int32_t kSetOrAction = OP_SET | OP_ACTION;
}  // namespace

constinit const CommandEntry command_table[COMMAND_COUNT] = {
    {"AT+JVCN", kSetOrAction, pending_family_handler},
    {"AT+ETST", kSetOrAction, unspecified_command_handler},  // not specified further
    {"AT+JVSJ", kSetOrAction, get_system_time_handler},
    {"AT+JVMMIUI", kSetOrAction, pending_family_handler},
    {"AT+JVSP", kSetOrAction, pending_family_handler},
    {"AT+JVBS", kSetOrAction, pending_family_handler},
    {"AT+LCMT", kSetOrAction, pending_family_handler},
    {"AT+OFFL", kSetOrAction, pending_family_handler},
    {"AT+EQSB", kSetOrAction, pending_family_handler},
    {"AT+TFST", kSetOrAction, tfst_handler},
    {"AT+JVROOT", kSetOrAction, pending_family_handler},
    {"AT+JVXL", kSetOrAction, play_ring_handler},
    {"AT+ESLP", kSetOrAction, pending_family_handler},
    {"AT+JVKJ", kSetOrAction, pending_family_handler},
    {"AT+JVDL", kSetOrAction, pending_family_handler},
    {"AT+JVIQ", kSetOrAction, unspecified_command_handler},  // not specified further
    {"AT+EDFT", kSetOrAction, pending_family_handler},
    {"AT+JVTWST", kSetOrAction, jvtwst_handler},
    {"AT+JVSIM", kSetOrAction, jvsim_handler},
    {"AT+JVSD", kSetOrAction, jvsd_handler},
    {"AT+JVMP", kSetOrAction, play_media_handler},
    {"AT+JVTR", kSetOrAction, unspecified_command_handler},  // not specified further
    {"AT+JVNC", kSetOrAction, pending_family_handler},
    {"AT+JVDLJ", kSetOrAction, pending_family_handler},
    {"AT+JVTFWR", kSetOrAction, jvtfwr_handler},
    {"AT+JVOTG", kSetOrAction, jvotg_handler},
    {"AT+JVUDWR", kSetOrAction, jvudwr_handler},
    {"AT+JVUDROOM", kSetOrAction, jvudroom_handler},
    {"AT+JVRDNV", kSetOrAction, pending_family_handler},
    {"AT+JVMD", kSetOrAction, ring_test_handler},
    {"AT+JVCHARGE", kSetOrAction, pending_family_handler},
    {"AT+JVCHARG", kSetOrAction, pending_family_handler},
    {"AT+RMCHARGEP", kSetOrAction, pending_family_handler},
    {"AT+OMENU", kSetOrAction, pending_family_handler},
    {"AT+JVADB", kSetOrAction, pending_family_handler},
    {"AT+JVDIAG", kSetOrAction, pending_family_handler},
    {"AT+JVFQ", kSetOrAction, jvfq_handler},
    {"AT+JVHALL", kSetOrAction, jvhall_handler},
    {"AT+JVTESTMMI", kSetOrAction, pending_family_handler},
    {"AT+JV3G", kSetOrAction, pending_family_handler},
    {"AT+JVOPTR", kSetOrAction, optr_flag_handler},
    {"AT+JVUPDATE", kSetOrAction, pending_family_handler},
    {"AT+JVOEM", kSetOrAction, check_oem_handler},
    {"AT+JVMODEL", kSetOrAction, jvmodel_handler},
    {"AT+JVLCD", kSetOrAction, pending_family_handler},
    {"AT+JVAPP", kSetOrAction, unspecified_command_handler},  // not specified further
    {"AT+JVG3G", kSetOrAction, pending_family_handler},
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
    {"AT+JVRTALL", kSetOrAction, pending_family_handler},
    {"AT+JVLOG", kSetOrAction, pending_family_handler},
    {"AT+MMICCM", kSetOrAction, pending_family_handler},
    {"AT+MMITW", kSetOrAction, pending_family_handler},
    {"AT+JVSFT", kSetOrAction, pending_family_handler},
    {"AT+JVDF", kSetOrAction, jvdf_handler},
    {"AT+JVFN", kSetOrAction, jvfn_handler},
    {"AT+ZNGF", kSetOrAction, smart_speaker_Amplifier_calibrate_handler},
    {"AT+JVSYJM", kSetOrAction, pending_family_handler},
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
    {"AT+JVFEATURE", kSetOrAction, pending_family_handler},
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
    {"AT+JVGJ", kSetOrAction, pending_family_handler},
    {"AT+JVREBOOT", kSetOrAction, pending_family_handler},
    {"AT+JVRT", kSetOrAction, pending_family_handler},
    {"AT+JVSG", kSetOrAction, pending_family_handler},
    {"AT+MMILED", kSetOrAction, pending_family_handler},
    {"AT+JVCOM", kSetOrAction, pending_family_handler},
    {"AT+JVMT", kSetOrAction, echo_handler},
    {"AT+JVTDNV", kSetOrAction, nv_66024_handler},
    {"AT+JVLOGAT", kSetOrAction, pending_family_handler},
    {"AT+JVQHZS", kSetOrAction, pending_family_handler},
    {"AT+JVLIGHT", kSetOrAction, pending_family_handler},
    {"AT+JVQLOG", kSetOrAction, pending_family_handler},
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
    {"AT+JVEFS", kSetOrAction, pending_family_handler},
    {"AT+JVVSIM", kSetOrAction, pending_family_handler},
    {"AT+JVDPDT", kSetOrAction, pending_family_handler},
    {"AT+JVFILE", kSetOrAction, pending_family_handler},
    {"AT+JVKTV", kSetOrAction, ktv_test_handler},
};

int pending_family_handler(char*, int, char*) { return RESULT_NOT_IMPLEMENTED; }

// These provisioning commands have a row but no behaviour of their own: "Not Implement".
int unspecified_command_handler(char*, int, char*) { return RESULT_NOT_IMPLEMENTED; }
