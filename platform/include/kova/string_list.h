#pragma once

/// A growing list of zero-ended texts, as the platform's enumerations return it. An enumeration appends to a list that
/// its caller has made and frees. Belongs to one thread at a time.

#ifdef __cplusplus
extern "C" {
#endif

typedef struct KLIBCSzList {
  int capacity;
  int count;
  char** items;
} KLIBCSzList;

/// A new empty list with room for `capacity` texts (it grows by itself); NULL when memory is short. The caller frees
/// it.
KLIBCSzList* KLIBCSzListAlloc(int capacity);
/// Appends a copy of `text`. The list may move: use `*list` afterwards. Returns the new count, or -1.
int KLIBCSzListPush(KLIBCSzList** list, const char* text);
/// The text at `index`, owned by the list; NULL outside 0 .. count-1.
const char* KLIBCSzListGet(const KLIBCSzList* list, int index);
/// Frees the list and its texts; NULL is allowed.
void KLIBCSzListFree(KLIBCSzList* list);

#ifdef __cplusplus
}
#endif
