#pragma once

/// The host's file-sharing service. The service itself is "samba" of kova/service.h.

#ifdef __cplusplus
extern "C" {
#endif

/// Whether Spotlight searches are on in the section of every share of this host that has one in the service's
/// configuration: 1 or 0. 0 as well when no share has a section there, without a file-sharing service, and when its
/// configuration cannot be read.
int KOVASMBIsEnableSpotlight(void);
/// Switches Spotlight on (1) or off (0) in these sections. 0, or below 0 with the configuration as it was; with no
/// section to switch KOVA_ERR_NOT_SUPPORTED.
int KOVASMBSetSpotlight(int enable);

#ifdef __cplusplus
}
#endif
