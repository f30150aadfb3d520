#define FERROX_SOURCE "util"
#include "fileindex/file_types.h"

#include <algorithm>
#include <array>

namespace ferrox::fileindex {

namespace {

// Extensions separated by blanks.
constexpr char kDocumentExtensions[] =
    "!!! $00 $01 $02 $04 $05 $o1 $ol 1 12da 1st 7 7z 82t 92t _me abap abl ac ada adiumhtmllog adiumlog adl "
    "adt adw ahk aiml alx aml android annot ans ansi application aprj apx aqt arff artask as asc ascii asl "
    "asp ass assoc atc att awa awb awd awh awp axt azw3 ba1 bad bas bat bbs bbxt bcr bdp bdr bea bel bep big "
    "big5 bk blm bln blw bmtp bna bnx bog box bpdx brf bsdl bss bt bz2 bzw c cag cas cascii cbl cc cd2 cfm "
    "charset chm cho chord cif cil ckn clg cli clix clj cmd cmtx cof coffee conf coo cpp crash crd cs "
    "csassembly csmanifest css csv ctd ctf ctl ctx d dart dcd dce ddd ddt de dectest des desc dfe dfm diff "
    "dii diskdefines diz dk dkz dmr dne doc docm docx dok dot dotm dotx dp dpv dqy drp dsc dsml dtd dwl ecsv "
    "edml edn edt efm eia ejs eml emulecollection en enc enf eng epub erl err es esw etf etx euc ext extra f "
    "faq fff ffp fin first flr fmr fnx fon forth fr fra frm fsa fth ftl full gbf gdt gen ger glsl gnu "
    "gnumeric go gpl groovy gs gthr gtx guide gz haml handlebars hdr hhc hhs hlm hlx hp8 hs hsk ht3 htm html "
    "htmls htx hvc hwl hx hz id31 id32 idc idt idx iem igv igy iif inc ini inuse ion ipr iqy isr it ivp ja "
    "jack jad jade jam java jeb jis jl jp1 js json jsp jss jsx jtx kahl kar kch key kix klg kor la label las "
    "latex lay less lin linux linx liquid lisp lit lnc lo_ log lrc ls lsl lst ltr ltt ltx lua lue luf lwd "
    "lxfml lyr lyt m man manifest map mar markdown mathml maxfr mcw md mdl mdle mdown mdtext mdtxt mdwn me "
    "mez mf mib mit mk mkd mkdn mno mnu mobi modd mpsub msg mss mtx mtxt mvg mw mysql nbr nclk ncm new nfo "
    "nix nlc nmbd nokogiri not notes now npdt nt numbers nwctxt ocaml ocr odb odc odf odg odi odm odp ods odt "
    "oh ojp omn oogl oot opc openbsd opml ort osi otc otf otg oth oti otp ots ott p3x pages panic pascal pbd "
    "pc5 pcl pd pdb pdf pdu perl pfs pgw php pjs pl pla plf plg plist plk pln pml pmo pod pot potm potx ppa "
    "pps ppsm ppsx ppt pptm pptx prc prn pro prr ps psb psi2 pt3 pts pvj pvw py q&a qdt qud r rar rb rbdf rbw "
    "rdf rea readme reg rel rep resp rest rff rhtml ris rml rqy rs rst rt rtf rtl rtx ru rus rzk rzn s s19 "
    "s2k sami sass sbv scad scala scm scss sct sdnf sen seq set sfb sgp sh sha1 sha512 sjs skcard skv slk sls "
    "smali smf smi sms snw soap soundscript spa spec spg spn spx sql srt srx ss ssa ssf st1 stf stq strings "
    "styl sub syn t t2t tab tar tbd tbl tbx tbz tce tcl tcm tdf ted tex text textclipping textile tfw tgf tgz "
    "thml thp tlb tle tlx tm tml tmprtf tmx tnef tph tpl trn trt tsv tt ttbl tte ttpl ttxt tx8 tx? txa txd "
    "txe txh txt u3i uax uhtml uk unauth uni unx us usa user usf usg utf8 utx utxt v vb ver vet vfk vhd vhdl "
    "vis vkp vmg vmsg vna vsmproj vw vw3 vxml wer wir wkf wn wrd wrl wsc wst wtf wtl wtx x20 x60 x70 x80 x90 "
    "xb0 xc0 xct xd0 xdl xdp xfd xff xhtm xlf xls xlsm xlsx xlt xltm xltx xml xq xquery xqy xsd xsl xslt xsr "
    "xwp xy xy3 xyp xyw xyz yaml yml zanebug zed zhp zib zip zw zxe";

constexpr char kAudioExtensions[] =
    "aac ac3 aif aiff ape cue dff dsf flac m3u m4a m4b m4p mp1 mp2 mp3 mpa ogg pcm pls ra ram wav wma wpl";

constexpr char kVideoExtensions[] =
    "3g2 3gp asf avi dat divx dvr-ms f4v flv ifo iso m2t m2ts m4v mkv mov mp4 mpeg mpg mts qt rm rmvb swf tp "
    "trp ts vdr vob wmv xvid";

constexpr char kImageExtensions[] =
    "3fr arw bmp cr2 crw dcr dng erf gif ico jpe jpeg jpg k25 kdc mef mos mrw nef orf pef png psd ptx raf raw "
    "rw2 sr2 srf tif tiff ufo x3f";

void Insert(std::unordered_map<std::string_view, FileType>& map, std::string_view extensions, FileType type) {
  while (!extensions.empty()) {
    const size_t end = std::min(extensions.find(' '), extensions.size());
    map.try_emplace(extensions.substr(0, end), type);
    extensions.remove_prefix(std::min(end + 1, extensions.size()));
  }
}

std::unordered_map<std::string_view, FileType> BuildExtensionMap() {
  std::unordered_map<std::string_view, FileType> map;
  map.reserve(1024);
  // Deliberate: a name without an extension is a document, as "README" is, not a file of another kind.
  map.try_emplace("", FILE_TYPE_DOCUMENT);
  Insert(map, kDocumentExtensions, FILE_TYPE_DOCUMENT);
  Insert(map, kAudioExtensions, FILE_TYPE_AUDIO);
  Insert(map, kVideoExtensions, FILE_TYPE_VIDEO);
  Insert(map, kImageExtensions, FILE_TYPE_IMAGE);
  return map;
}

/// No key of the table is longer, so that a longer extension need not be copied.
constexpr size_t kLongestExtensionBytes = 16;

}  // namespace

const std::unordered_map<std::string_view, FileType>& GetExtensionMap() {
  static const auto map = BuildExtensionMap();
  return map;
}

// Called for each file of a share: works in place, without a copy of the path.
FileType GetFileTypeByFullPath(const std::string& path) {
  std::string_view name = path;
  const size_t slash = name.rfind('/');
  if (slash != std::string_view::npos) name.remove_prefix(slash + 1);
  const size_t dot = name.rfind('.');
  const std::string_view extension = dot == std::string_view::npos ? std::string_view() : name.substr(dot + 1);
  if (extension.size() > kLongestExtensionBytes) return FILE_TYPE_OTHER;
  std::array<char, kLongestExtensionBytes> lower = {};
  std::transform(extension.begin(), extension.end(), lower.begin(), ToLowerAscii);
  const auto found = GetExtensionMap().find({lower.data(), extension.size()});
  return found == GetExtensionMap().end() ? FILE_TYPE_OTHER : found->second;
}

}  // namespace ferrox::fileindex
