#define FERROX_SOURCE "util"
#include "fileindex/util.h"

namespace ferrox::fileindex {

// Deliberate: texts of their own, not made from the table of file_types.cpp. That of documents has far fewer
// extensions, and "cs" twice; callers have the texts as they stand.
const std::map<std::string, std::string>& GetCategoryQueries() {
  static const std::map<std::string, std::string> queries = {
      {"document",
       "docx OR wri OR rtf OR xla OR xlb OR xlc OR xld OR xlk OR xll OR xlm OR xlt OR xlv OR xlw OR xlsx OR "
       "xlsm OR xlsb OR xltm OR xlam OR pptx OR pps OR ppsx OR pdf OR txt OR doc OR xls OR ppt OR odt OR ods "
       "OR odp OR odg OR odc OR odf OR odb OR odi OR odm OR ott OR ots OR otp OR otg OR otc OR otf OR oti OR "
       "oth OR potx OR pptm OR ppsm OR potm OR dotx OR dot OR pot OR ppa OR xltx OR docm OR dotm OR eml OR "
       "msgc OR c OR cc OR cpp OR cs OR cxx OR ada OR coffee OR cs OR css OR js OR json OR lisp OR markdown "
       "OR ocaml OR pl OR py OR rb OR sass OR scala OR r OR tex OR conf OR csv OR sub OR srt OR md OR log OR "
       "mobi OR azw3 OR pdb OR epub OR chm OR lit"},
      {"audio",
       "aac OR ac3 OR aif OR aiff OR ape OR cue OR dff OR dsf OR flac OR m3u OR m4a OR m4b OR m4p OR mp1 OR "
       "mp2 OR mp3 OR mpa OR ogg OR pcm OR pls OR ra OR ram OR wav OR wma OR wpl"},
      {"video",
       "3g2 OR 3gp OR asf OR avi OR dat OR divx OR dvr-ms OR f4v OR flv OR ifo OR iso OR m2t OR m2ts OR m4v "
       "OR mkv OR mov OR mp4 OR mpeg OR mpg OR mts OR qt OR rm OR rmvb OR swf OR tp OR trp OR ts OR vdr OR "
       "vob OR wmv OR xvid"},
      {"image",
       "3fr OR arw OR bmp OR cr2 OR crw OR dcr OR dng OR erf OR gif OR ico OR jpe OR jpeg OR jpg OR k25 OR "
       "kdc OR mef OR mos OR mrw OR nef OR orf OR pef OR png OR psd OR ptx OR raf OR raw OR rw2 OR sr2 OR "
       "srf OR tif OR tiff OR ufo OR x3f"},
  };
  return queries;
}

}  // namespace ferrox::fileindex
