#pragma once

/// The platform's error details. Each platform call that fails sets them for its own thread; they stay until the next
/// failure of that thread. Calls that succeed leave them alone: ask only after a call has failed. The codes are what
/// programs decide by; the place is for the log.
///   if (KOVAShareGet(name, &share) < 0 && KLIBCErrGet() == KOVA_ERR_NO_SUCH_SHARE) return NotThere(name);

#ifdef __cplusplus
extern "C" {
#endif

enum {
  KOVA_ERR_NONE = 0,
  /// An argument is null, empty, too long, or not of the form that the call asks for.
  KOVA_ERR_BAD_PARAMETER = 0x0D00,
  KOVA_ERR_BAD_CONFIGURATION = 0x0E00,  ///< the share table or the configuration cannot be used
  KOVA_ERR_NO_SUCH_SHARE = 0x1400,
  KOVA_ERR_NO_SUCH_USER = 0x1D00,
  KOVA_ERR_OUT_OF_SPACE = 0x2400,   ///< the file system is full
  KOVA_ERR_OVER_QUOTA = 0x2900,     ///< the user's quota is used up
  KOVA_ERR_SYSTEM = 0x2A00,         ///< a system call failed; errno tells which way
  KOVA_ERR_NOT_SUPPORTED = 0xD900,  ///< this host has no such thing
};

/// The code of this thread's last failure, KOVA_ERR_NONE before the first.
int KLIBCErrGet(void);
/// The source file and line that reported it; "" and 0 before the first. The text is static.
const char* KLIBCErrorGetFile(void);
int KLIBCErrorGetLine(void);

#ifdef __cplusplus
}
#endif
