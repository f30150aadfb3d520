#pragma once

/// The names of the document fields that content extraction fills and the search engine stores, one constant each: the
/// field "KOVAMDPath" is kKOVAMDPath, "_KOVAMDUserTags" is k_KOVAMDUserTags. Stored documents use them: a name never
/// changes, odd as some are ("KOVAMDContactKeyworlds", "KOVAMDRecodingDate", "KOVAStateOrProvince").
///
/// All sources take the names from here, so that one that is spelt wrong does not compile; in JSON that is written out
/// as a text (the index's mappings, the tests' requests) they stand as they are. The header needs no library: the
/// workers that read files, and the host's platform, use nothing else of the library's. What a worker gives under any
/// other name is dropped (kovacontentextractd/answer.cpp). The types of the fields, and how they are searched, are
/// those of the mappings (elastic::GetFileIndexMappings). The families of names:
///
///   KOVAMDFS...          facts about the file that need no look into it: size, dates, name
///   KOVAMDPath, -Parent  where it lies; the document's id is its path
///   KOVAMD...            what was read from its content; each reader fills those that its format has
///   _KOVAMD...           of the desktop's tags and labels
///   _KOVA...             for programs, below; nobody searches them
namespace ferrox::fileindex::elastic {

// clang-format off
#define FERROX_FIELD_NAMES(X) \
  X(KOVAMDAttributeChangeDate) X(KOVAMDAudiences) X(KOVAMDAuthors) X(KOVAMDAuthorAddresses) X(KOVAMDCity) \
  X(KOVAMDComment) X(KOVAMDContactKeyworlds) X(KOVAMDContentCreationDate) X(KOVAMDContentModificationDate) \
  X(KOVAMDContentType) X(KOVAMDContentTypeTree) X(KOVAMDContributors) X(KOVAMDCopyright) X(KOVAMDCountry) \
  X(KOVAMDCoverage) X(KOVAMDCreator) X(KOVAMDDescription) X(KOVAMDDisplayName) X(KOVAMDDueDate) \
  X(KOVAMDDurationSecond) X(KOVAMDEmailAddresses) X(KOVAMDEncodingApplications) X(KOVAMDFinderComment) \
  X(KOVAMDFonts) X(KOVAMDHeadline) X(KOVAMDIdentifier) X(KOVAMDInstantMessageAddresses) X(KOVAMDInstructions) \
  X(KOVAMDKeywords) X(KOVAMDKind) X(KOVAMDLanguages) X(KOVAMDLastUsedDate) X(KOVAMDNumberOfPages) \
  X(KOVAMDNamedLocation) X(KOVAMDOrganizations) X(KOVAMDPageHeight) X(KOVAMDPageWidth) X(KOVAMDParticipants) \
  X(KOVAMDPhoneNumbers) X(KOVAMDProjects) X(KOVAMDPublishers) X(KOVAMDRecipients) X(KOVAMDRecipientAddresses) \
  X(KOVAMDRights) X(KOVAMDSecurityMethod) X(KOVAMDStarRating) X(KOVAStateOrProvince) X(KOVAMDTextContent) \
  X(KOVAMDTitle) X(KOVAMDVersion) X(KOVAMDWhereFroms) X(KOVAMDAcquisitionMake) X(KOVAMDAcquisitionModel) \
  X(KOVAMDAlbum) X(KOVAMDAperture) X(KOVAMDBitsPerSample) X(KOVAMDColorSpace) X(KOVAMDEXIFVersion) \
  X(KOVAMDExposureMode) X(KOVAMDExposureProgram) X(KOVAMDExposureTimeSeconds) X(KOVAMDExposureTimeString) \
  X(KOVAMDFNumber) X(KOVAMDFlashOnOff) X(KOVAMDFocalLength) X(KOVAMDHasAlphaChannel) X(KOVAMDISOSpeed) \
  X(KOVAMDLayerNames) X(KOVAMDMaxAperture) X(KOVAMDMeteringMode) X(KOVAMDOrientation) X(KOVAMDPixelHeight) \
  X(KOVAMDPixelWidth) X(KOVAMDPixelCount) X(KOVAMDProfileName) X(KOVAMDRedEyeOnOff) X(KOVAMDResolutionHeightDPI) \
  X(KOVAMDResolutionWidthDPI) X(KOVAMDWhiteBalance) X(KOVAMDAudioBitRate) X(KOVAMDCodecs) X(KOVAMDDeliveryType) \
  X(KOVAMDMediaTypes) X(KOVAMDStreamable) X(KOVAMDTotalBitRate) X(KOVAMDVideoBitRate) \
  X(KOVAMDAppleLoopDescriptors) X(KOVAMDAppleLoopsKeyFilterType) X(KOVAMDAppleLoopsLoopMode) \
  X(KOVAMDAppleLoopsRootKey) X(KOVAMDAudioChannelCount) X(KOVAMDAudioEncodingApplication) X(KOVAMDAudioSampleRate) \
  X(KOVAMDAudioTrackNumber) X(KOVAMDComposer) X(KOVAMDGeneralMIDISequence) X(KOVAMDKeySignature) X(KOVAMDLyricist) \
  X(KOVAMDMusicalGenre) X(KOVAMDMusicalInstrumentCategory) X(KOVAMDMusicalInstrumentName) X(KOVAMDRecodingDate) \
  X(KOVAMDRecordingYear) X(KOVAMDTempo) X(KOVAMDTimeSignature) X(KOVAMDFSContentChangeDate) \
  X(KOVAMDFSCreationDate) X(KOVAMDFSInvisible) X(KOVAMDFSIsExtensionHidden) X(KOVAMDFSLabel) X(KOVAMDFSName) \
  X(KOVAMDFSNodeCount) X(KOVAMDOwnerGroupID) X(KOVAMDOwnerUserID) X(KOVAMDFSSize) X(KOVAMDPath) X(_KOVAMDUserTags) \
  X(KOVAMDParent) X(KOVAMDSearchFileName) X(KOVAMDExtension) X(KOVAMDPrivilege) X(KOVAMDIsDir) X(KOVAMDWildcard) \
  X(_KOVAMDFinderLabel) X(_KOVAMDGroupId) X(KOVAMDFinderOpenDate) X(KOVAMDLogicalSize) X(KOVAMDPhysicalSize) \
  X(KOVAMDDateAdded) X(KOVAMDPeopleDisplayName)
// clang-format on

// One constant a field, and below all of them in one list.
#define FERROX_DEFINE_FIELD(name) inline constexpr char k##name[] = #name;
FERROX_FIELD_NAMES(FERROX_DEFINE_FIELD)
#undef FERROX_DEFINE_FIELD

#define FERROX_LIST_FIELD(name) k##name,
inline constexpr const char* kFieldNames[] = {FERROX_FIELD_NAMES(FERROX_LIST_FIELD)};
#undef FERROX_LIST_FIELD

// Members of stored documents that are for programs: they are no fields of the schema, and not in kFieldNames.
inline constexpr char k_KOVAStamp[] = "_KOVAStamp";    ///< text: differs when size, times or inode do; ends in the
                                                       ///< last "." and the inode's number
inline constexpr char k_KOVAAccess[] = "_KOVAAccess";  ///< text: owner, group, mode and ACL (docs/formats/engine.md)
inline constexpr char k_KOVANeedMeta[] = "_KOVANeedMeta";  ///< bool: the content was wanted when it was written
inline constexpr char k_KOVAExtractVersion[] = "_KOVAExtractVersion";  ///< int: of the reader; 0: there is none
inline constexpr char k_KOVAExtractError[] = "_KOVAExtractError";  ///< text: why content, or a part, could not be read
inline constexpr char k_KOVATextCut[] = "_KOVATextCut";            ///< bool: there was more text than is kept
inline constexpr char k_KOVATextEncoding[] = "_KOVATextEncoding";  ///< text: of the file's bytes, for people

// The settings of content extraction. The library itself sends the first; the others are for programs that were built
// with them.
inline constexpr char kNeedMeta[] = "need_meta";  ///< in the configuration: whether the content is read, too
inline constexpr char kCfg[] = "cfg";
inline constexpr char kPath[] = "path";
inline constexpr char kPseudoPath[] = "pseudo_path";
inline constexpr char kContentExtractd[] = "kovacontentextractd";
inline constexpr char kContentExtractdPidPath[] = "/var/run/kovacontentextractd.pid";
inline constexpr char kContentExtractdShmPath[] = "/tmp/kovace_shm";

}  // namespace ferrox::fileindex::elastic
