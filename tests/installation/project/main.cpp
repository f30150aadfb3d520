#include <cstdio>

#include "common/error.h"
#include "fileindex/elastic/elastic_control.h"
#include "fileindex/util.h"

// Exceptions must cross the library's border, too.
int main() {
  try {
    ferrox::fileindex::GetShareNameByPath("no slash");
  } catch (const ferrox::Error& error) {
    const int kind = ferrox::fileindex::GetFileTypeByFullPath("/a.mp3");
    (void)printf("%d %d %s\n", static_cast<int>(error.Code()), kind,
                 ferrox::fileindex::elastic::GetFileIndexID("photo").c_str());
    return 0;
  }
  return 1;
}
