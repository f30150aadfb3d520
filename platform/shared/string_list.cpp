#include <climits>
#include <cstdlib>
#include <cstring>

#include <kova/string_list.h>

#include "platform/shared/failure.h"

namespace {

bool Grow(KLIBCSzList* list) {
  if (list->count < list->capacity) return true;
  if (list->capacity > INT_MAX / 2) return false;
  const int capacity = list->capacity < 8 ? 16 : list->capacity * 2;
  auto* items = static_cast<char**>(realloc(list->items, static_cast<size_t>(capacity) * sizeof(char*)));
  if (items == nullptr) return false;
  list->items = items;
  list->capacity = capacity;
  return true;
}

}  // namespace

KLIBCSzList* KLIBCSzListAlloc(int capacity) {
  if (capacity < 0) {
    (void)KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
    return nullptr;
  }
  auto* list = static_cast<KLIBCSzList*>(calloc(1, sizeof(KLIBCSzList)));
  if (list == nullptr) return nullptr;
  list->items = static_cast<char**>(calloc(static_cast<size_t>(capacity) + 1, sizeof(char*)));
  if (list->items == nullptr) {
    free(list);
    return nullptr;
  }
  list->capacity = capacity;
  return list;
}

int KLIBCSzListPush(KLIBCSzList** list, const char* text) {
  if (list == nullptr || *list == nullptr || text == nullptr) return KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
  char* copy = Grow(*list) ? strdup(text) : nullptr;
  if (copy == nullptr) return KOVA_FAIL(KOVA_ERR_SYSTEM);
  (*list)->items[(*list)->count++] = copy;
  return (*list)->count;
}

const char* KLIBCSzListGet(const KLIBCSzList* list, int index) {
  if (list == nullptr || index < 0 || index >= list->count) return nullptr;
  return list->items[index];
}

void KLIBCSzListFree(KLIBCSzList* list) {
  if (list == nullptr) return;
  for (int i = 0; i < list->count; ++i) free(list->items[i]);
  free(list->items);
  free(list);
}
