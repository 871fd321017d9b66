#include "connectivity/debug_tags.h"

#include <cutils/properties.h>
#include <stdlib.h>

#include "core/properties.h"
#include "core/sleep.h"

namespace corvexd {
namespace {

constexpr int kPasses = 8;
constexpr time_t kPassPeriod = 2;  // seconds

constexpr const char* kBluetoothTags[] = {
    "log.tag.BluetoothPan",    "log.tag.Handsfree",       "log.tag.BluetoothPbapVcardManager",
    "log.tag.BluetoothPbap",   "log.tag.BluetoothMap",    "log.tag.BluetoothHidHost",
    "log.tag.BluetoothHidDev", "log.tag.SapRilReceiver",  "log.tag.BluetoothSap",
    "log.tag.BluetoothOpp",    "log.tag.BluetoothSocket", "log.tag.DockService",
};
static_assert(sizeof kBluetoothTags / sizeof *kBluetoothTags == 12, "every tag is there");

constexpr const char* kNfcTags[] = {
    "log.tag.NfcHandover",     "log.tag.BeamManager",       "log.tag.HandoverServer",
    "log.tag.NfcDispatcher",   "log.tag.BeamShareActivity", "log.tag.BluetoothPeripheralHandover",
    "log.tag.SnepClient",      "log.tag.HandoverClient",    "log.tag.SnepMessenger",
    "log.tag.ForegroundUtils", "log.tag.SnepServer",        "log.tag.NFC",
};
static_assert(sizeof kNfcTags / sizeof *kNfcTags == 12, "every tag is there");

// One name looks cut, and is: a property name has at most 31 characters.
constexpr const char* kLocationTags[] = {
    "log.tag.GnssLocationProvider",
    "log.tag.LocationManagerService",
    "log.tag.GpsXtraDownloader",
    "log.tag.LocSvc_afw",
    "log.tag.LocSvc_EngAdapter",
    "log.tag.LocSvc_LBSProxy",
    "log.tag.LocSvc_LBSApiBase",
    "log.tag.LocSvc_LBSApiV02",
    "log.tag.LocSvc_api_v02",
    "log.tag.LocSvc_ApiV02",
    "log.tag.LocSvc_eng",
    "log.tag.LocSvc_ext",
    "log.tag.LocSvc_java",
    "log.tag.LocSvc_jni",
    "log.tag.LocSvc_NiH",
    "log.tag.LocSvc_LocUlpProxy",
    "log.tag.LocSvc_libulp",
    "log.tag.GeofenceManager",
    "log.tag.IzatServiceBase",
    "log.tag.UnifiedLocationService",
    "log.tag.NetworkLocationService",
    "log.tag.UnifiedLocationProvider",
    "log.tag.NetworkLocationProvider",
    "log.tag.IzatProviderBase",
    "log.tag.IzatProviderEngine",
    "log.tag.OsAgent",
    "log.tag.GNPProxy",
    "log.tag.GmsNetworkLocationProvi",
    "log.tag.LBSSystemMonitorService",
    "log.tag.LocationServiceReceiver",
    "log.tag.RilInfoMonitor",
    "log.tag.UlpEngine",
    "log.tag.UlpService",
    "log.tag.Wiper",
    "log.tag.XTWiFiLP",
    "log.tag.XTWiFiOS",
    "log.tag.XTWiFiZpp",
    "log.tag.NlpProxyProvider",
    "log.tag.NlpProxy",
    "log.tag.GpsXtraDownloader-Q",
    "log.tag.LocSvc_NiA",
    "log.tag.GeoFenceService",
    "log.tag.GeoFenceKeeper",
    "log.tag.PosMgr",
    "log.tag.MQClient",
    "log.tag.InPostcard",
    "log.tag.QCALOG",
    "log.tag.LocSvc_launcher",
    "log.tag.gpsone_dmn",
    "log.tag.FusedLocationProvider",
    "log.tag.FlpHardwareProvider",
    "log.tag.IZatManager",
    "log.tag.IzatService",
    "log.tag.FlpServiceProvider",
    "log.tag.XTActivity",
    "log.tag.XTSettingInjectorSrv",
    "log.tag.XTSrv",
    "log.tag.IzatSettingsInjector",
    "log.tag.LocationSettings",
    "log.tag.LocationSettingsBase",
    "log.tag.SettingsInjector",
    "log.tag.XTBroadcastReceiver",
    "log.tag.GeofenceServiceProvider",
    "log.tag.NpProxy",
};
static_assert(sizeof kLocationTags / sizeof *kLocationTags == 64, "every tag is there");

template <size_t N>
void set_level(const char* const (&tags)[N], int enable) {
  const char* level = enable == 1 ? "VERBOSE" : "INFO";
  for (const char* tag : tags) property_set(tag, level);
}

int read_switch(const char* property) {
  char value[PROPERTY_VALUE_MAX];
  property_get(property, value, "0");
  return atoi(value);
}

}  // namespace

void set_bluetooth_android_log(int enable) { set_level(kBluetoothTags, enable); }

void set_nfc_android_log(int enable) { set_level(kNfcTags, enable); }

void set_gps_android_log(int enable) { set_level(kLocationTags, enable); }

void set_connectivit_android_log() {
  if (property_is("persist.sys.assert.panic", "true")) property_set("persist.oem.nfc.debug", "1");
  set_nfc_android_log(read_switch("persist.oem.nfc.debug"));
  set_gps_android_log(read_switch("persist.oem.gps.debug"));
  read_switch("persist.oem.wifi.debug");  // governs no tag yet
  set_bluetooth_android_log(read_switch("persist.oem.bt.debug"));
}

void* connectivity_log_check(void*) {
  for (int pass = 0; pass < kPasses; ++pass) {
    set_connectivit_android_log();
    sleep_seconds(kPassPeriod);
  }
  return nullptr;
}

}  // namespace corvexd
