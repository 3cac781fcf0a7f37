// Whether the applications package on the memory card was built for this phone.
#pragma once

// 0 when "apps.version" in "/sdcard/apps.zip" names this build's project and version; 2 when
// the package has no such entry; another non-zero value on any other mismatch or failure.
int isAppVersionMatched();
