#pragma once

/// The host's file-sharing service. The service itself is "samba" of kova/service.h.

#ifdef __cplusplus
extern "C" {
#endif

/// Whether Spotlight searches are on in every share that the file-sharing service offers: 1 or 0. Without a
/// file-sharing service, or when its configuration cannot be read, 0.
int KOVASMBIsEnableSpotlight(void);
/// Switches Spotlight on (1) or off (0) in each of these shares' sections of the service's configuration. 0, or below
/// 0 with the configuration as it was; without a file-sharing service KOVA_ERR_NOT_SUPPORTED.
int KOVASMBSetSpotlight(int enable);

#ifdef __cplusplus
}
#endif
