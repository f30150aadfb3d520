#pragma once

/// A growing list of zero-ended texts, as the platform's enumerations return it. An enumeration appends to a list that
/// its caller has made and frees. Belongs to one thread at a time.
///   KLIBCSzList* list = KLIBCSzListAlloc(16);
///   if (list != NULL && KLIBShareEnum(&list, NULL) >= 0)
///     for (int i = 0; i < list->count; ++i) puts(KLIBCSzListGet(list, i));
///   KLIBCSzListFree(list);

#ifdef __cplusplus
extern "C" {
#endif

/// `count` is for callers to read; for everything else there are the functions below.
typedef struct KLIBCSzList {
  int capacity;  ///< how many texts fit before the list grows
  int count;     ///< how many there are
  char** items;  ///< `count` texts, each the list's own; no null pointer ends them
} KLIBCSzList;

/// A new empty list with room for `capacity` texts (it grows by itself); NULL when memory is short. The caller frees
/// it.
KLIBCSzList* KLIBCSzListAlloc(int capacity);
/// Appends a copy of `text`. The list may move: use `*list` afterwards. Returns the new count, or -1, with the texts of
/// the list as they were, when an argument is null or memory is short.
int KLIBCSzListPush(KLIBCSzList** list, const char* text);
/// The text at `index`, owned by the list; NULL outside 0 .. count-1.
const char* KLIBCSzListGet(const KLIBCSzList* list, int index);
/// Frees the list and its texts; NULL is allowed.
void KLIBCSzListFree(KLIBCSzList* list);

#ifdef __cplusplus
}
#endif
