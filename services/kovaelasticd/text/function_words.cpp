#include "services/kovaelasticd/text/function_words.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <sstream>
#include <unordered_map>

#include "services/kovaelasticd/text/fold.h"

namespace ferrox::engine {

namespace {

/// Articles, pronouns, prepositions, conjunctions, auxiliary verbs and words that ask, by language; folded when read.
constexpr const char* kFunctionWords[] = {
    "a an the this that these those some any such and or but if than then so of in on at to for from by with as about "
    "into is are was were be been being am do does did has have had having can could may might must shall should will "
    "would what which who whom whose when where why how i me my we us our you your he him his she her they them their "
    "it its there one anyone all both each between during over under within through no not",
    "der die das den dem des ein eine einen einem einer eines und oder aber wenn als dass dieser diese dieses in im an "
    "am auf aus bei mit nach von vom zu zum zur für über um durch ist sind war waren sein bin hat haben hatte kann "
    "können könnte muss müssen soll sollte wird werden wurde wie was wer wen wem wessen wann wo warum welche welcher "
    "welches welchen ich mich mir mein meine meinen meiner wir uns unser unsere du dein er sie es ihr ihre man sich",
    "le la les l un une des du de d et ou mais si que qui quoi dont où quand comment pourquoi quel quelle quels "
    "quelles "
    "ce cet cette ces à au aux en dans sur par pour avec est sont était être ai as a avons ont avoir fait faire peut "
    "peux puis dois doit faut je me mon ma mes nous notre nos vous votre vos il elle ils elles on se son sa ses leur y",
    "el la los las un una unos unas y o u pero si que qué quién cuál cuáles cuándo dónde cómo por para con de del a al "
    "en sobre es son era ser está están estar ha han hay haber puedo puede pueden debe debo hacer se me mi mis yo "
    "nosotros nuestro nuestra tu su sus este esta estos estas ese esa eso lo le les",
    "il lo la i gli le l un uno una e ed o ma se che chi cosa quale quali quando dove come perché di del dello della "
    "dei degli delle a al allo alla ai agli alle da dal dalla in nel nella su sul sulla per con è sono era essere ha "
    "hanno ho avere può posso devo deve fare si mi mio mia miei noi nostro suo sua questo questa questi queste",
    "o a os as um uma uns umas e ou mas se que quem qual quais quando onde como porque por para com de do da dos das "
    "em "
    "no na nos nas ao aos à às sobre é são era ser está estão estar tem têm ter há posso pode podem deve devo fazer eu "
    "me meu minha nós nosso nossa seu sua este esta isto esse essa",
    "de het een en of maar als dat die dit deze in op aan bij met naar van voor uit over om door te is zijn was waren "
    "ben heeft hebben had kan kunnen kon moet moeten mag wordt worden werd hoe wat wie wanneer waar waarom welke welk "
    "ik "
    "mij me mijn wij we ons onze je jij uw u hij zij ze er men",
    "en ett den det de och eller men om att som denna detta dessa i på av med till från för vid över är var vara har "
    "hade kan kunde måste ska skall skulle blir bli hur vad vem när var varför vilken vilket vilka jag mig min mitt "
    "mina "
    "vi oss vår vårt du din han hon man sig sin",
    "en et den det de og eller men hvis at som denne dette disse i på af av med til fra for ved over er var være har "
    "havde hadde kan kunne må skal skulle bliver blir hvordan hvad hva hvem hvornår når hvor hvorfor hvilken hvilket "
    "hvilke jeg mig meg min mit mitt mine vi os oss vores vår du din han hun man sig seg sin",
    "ja tai mutta jos että joka jotka mikä mitä mitkä kuka ketä milloin missä mistä mihin miten kuinka miksi on ovat "
    "oli "
    "olla olen voi voin voidaan pitää täytyy minä minun me meidän sinä hän se ne tämä nämä",
    "и или но если что чтобы который которая которые кто как когда где почему какой какая какие в во на с со к ко от "
    "до "
    "из у о об по для за при это этот эта эти то я мне мой моя мои мы нас наш вы вас он она они его ее их ли бы быть "
    "есть был была можно нужно",
};
constexpr size_t kLists = std::size(kFunctionWords);

/// The lists that have a word, as bits.
using WordLists = std::unordered_map<std::string, uint32_t>;

WordLists ReadLists() {
  WordLists lists;
  for (size_t list = 0; list < kLists; ++list) {
    std::istringstream words(kFunctionWords[list]);
    for (std::string word; words >> word;) lists[FoldText(word)] |= uint32_t{1} << list;
  }
  return lists;
}

}  // namespace

std::vector<bool> FindFunctionWords(const std::vector<std::string>& words) {
  static const WordLists kWordLists = ReadLists();
  std::vector<uint32_t> listed;
  listed.reserve(words.size());
  std::array<size_t, kLists> counts{};
  for (const std::string& word : words) {
    const auto found = kWordLists.find(word);
    listed.push_back(found == kWordLists.end() ? 0 : found->second);
    for (size_t list = 0; list < kLists; ++list) counts[list] += listed.back() >> list & 1;
  }
  const auto most = std::max_element(counts.begin(), counts.end());
  std::vector<bool> are(words.size(), false);
  if (*most < 2 || *most == words.size()) return are;
  const auto list = static_cast<size_t>(most - counts.begin());
  for (size_t i = 0; i < words.size(); ++i) are[i] = (listed[i] >> list & 1) != 0;
  return are;
}

}  // namespace ferrox::engine
