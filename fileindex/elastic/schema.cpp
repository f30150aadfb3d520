#define FERROX_SOURCE "elastic_control"
#include "common/json_util.h"
#include "common/log.h"
#include "fileindex/elastic/elastic_control.h"

namespace ferrox::fileindex::elastic {

namespace {

// Part of every index that is made: a text that changes here concerns new indices only. Old ones keep the schema with
// which they were made until they are rebuilt.
// Deliberate: "white space" with its blank, and KOVAMDFinderLabel and KOVAMDGroupId without the leading underscore of
// the fields' names; existing indices were made so.
constexpr char kMappings[] = R"json({
	"property_id": "KOVAMDPath",
	"default": {
		"type": "string",
		"analyzer": "kovastandard",
		"required": false,
		"stored": true,
		"_all": true
	},
	"properties": {
		"KOVAMDPath": {
			"analyzer": "keyword",
			"required": true,
			"_all": false
		},
		"KOVAMDFSName": {
			"analyzer": "keyword",
			"_all": false
		},
		"KOVAMDPrivilege": {
			"analyzer": "keyword",
			"_all": false
		},
		"KOVAMDIsDir": {
			"type": "bool",
			"_all": false
		},
		"KOVAMDOwnerUserID": {
			"analyzer": "keyword",
			"_all": false
		},
		"KOVAMDOwnerGroupID": {
			"analyzer": "keyword",
			"_all": false
		},
		"KOVAMDFSSize": {
			"type": "int"
		},
		"KOVAMDFSContentChangeDate": {
			"type": "int"
		},
		"KOVAMDAttributeChangeDate": {
			"type": "int"
		},
		"KOVAMDFSCreationDate": {
			"type": "int"
		},
		"KOVAMDContentModificationDate": {
			"type": "int"
		},
		"KOVAMDLastUsedDate": {
			"type": "int"
		},
		"KOVAMDContentCreationDate": {
			"type": "int"
		},
		"KOVAMDAuthors": {
			"type": "text",
			"analyzer": "white space"
		},
		"KOVAMDTitle": {
			"type": "text"
		},
		"KOVAMDAlbum": {
			"type": "text"
		},
		"KOVAMDIdentifier": {
			"type": "text",
			"analyzer": "keyword",
			"_all": false
		},
		"KOVAMDAudioTrackNumber": {
			"type": "int"
		},
		"KOVAMDRecordingYear": {
			"type": "int"
		},
		"KOVAMDCreator": {
			"type": "text",
			"analyzer": "white space"
		},
		"KOVAMDMusicalGenre": {
			"type": "text"
		},
		"KOVAMDComposer": {
			"type": "text",
			"analyzer": "white space"
		},
		"KOVAMDComment": {
			"type": "text"
		},
		"KOVAMDDurationSecond": {
			"type": "double"
		},
		"KOVAMDAudioBitRate": {
			"type": "int"
		},
		"KOVAMDTotalBitRate": {
			"type": "int"
		},
		"KOVAMDVideoBitRate": {
			"type": "int"
		},
		"KOVAMDAudioSampleRate": {
			"type": "int"
		},
		"KOVAMDAudioChannelCount": {
			"type": "int"
		},
		"KOVAMDISOSpeed": {
			"type": "int"
		},
		"KOVAMDCodecs": {
			"type": "text",
			"analyzer": "white space"
		},
		"KOVAMDDescription": {
			"type": "text"
		},
		"KOVAMDAcquisitionMake": {
			"type": "text",
			"analyzer": "white space"
		},
		"KOVAMDAcquisitionModel": {
			"type": "text",
			"analyzer": "white space"
		},
		"KOVAMDExposureTimeString": {
			"analyzer": "keyword"
		},
		"KOVAMDAperture": {
			"analyzer": "keyword"
		},
		"KOVAMDResolutionWidthDPI": {
			"type": "int"
		},
		"KOVAMDResolutionHeightDPI": {
			"type": "int"
		},
		"KOVAMDMediaTypes": {
			"analyzer": "keyword"
		},
		"KOVAMDParent": {
			"analyzer": "keyword",
			"_all": false
		},
		"KOVAMDExtension": {
			"analyzer": "keyword",
			"_all": false
		},
		"KOVAMDTextContent": {
			"type": "text"
		},
		"KOVAMDKeywords": {},
		"KOVAMDFinderLabel": {
			"type": "int"
		},
		"KOVAMDGroupId": {
			"analyzer": "keyword"
		},
		"KOVAMDFinderOpenDate": {
			"type": "int"
		},
		"KOVAMDLogicalSize": {
			"type": "int"
		},
		"KOVAMDPhysicalSize": {
			"type": "int"
		},
		"KOVAMDDateAdded": {
			"type": "int"
		},
		"KOVAMDSearchFileName": {
			"type": "text",
			"analyzer": "white space",
			"preprocess": ["tolower", "ngram"]
		},
		"KOVAMDStarRating": {
			"analyzer": "keyword"
		},
		"_KOVAMDUserTags": {
			"type": "text"
		},
		"KOVAMDSpotlightBoost": {
			"type": "text",
			"analyzer": "white space"
		}
	}
})json";

// A library beside the package, named to the engine when an index is made. An engine may do without it.
constexpr char kEventHandler[] = R"json({
	"lib_path": "/var/packages/Ferrox/target/handler/fileindex_event_handler.so"
})json";

}  // namespace

Json::Value GetFileIndexSettings() { return Json::Value(Json::objectValue); }

Json::Value GetFileIndexMappings() {
  Json::Value mappings;
  FERROX_FAIL_IF_AS(!fromString(mappings, kMappings), "!ret.fromString(mappings)", Error::kInternal);
  return mappings;
}

Json::Value GetFileIndexEventHandler() {
  Json::Value handler;
  FERROX_FAIL_IF_AS(!fromString(handler, kEventHandler), "!ret.fromString(event_handler)", Error::kInternal);
  return handler;
}

}  // namespace ferrox::fileindex::elastic
