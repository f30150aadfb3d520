#pragma once

namespace ferrox::extract {

/// PDF names most encodings of East Asian text without holding them; their tables are files that the library opens when
/// a document names one, which is too late in a worker without file system. Makes them all readable from memory: they
/// are mapped, so that only those in use cost more than an address. To be called before the worker is closed in.
void HoldCharacterTables();

}  // namespace ferrox::extract
