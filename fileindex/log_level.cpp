#include "fileindex/util.h"

namespace ferrox::fileindex {

int log_level = 0;

}  // namespace ferrox::fileindex
