// Singly linked lists of data that belongs to the caller.
#ifndef VORN_LIST_H
#define VORN_LIST_H

#ifdef __cplusplus
extern "C" {
#endif

typedef struct QAZLLNode {
  void* data;
  struct QAZLLNode* next;
  // The last node, kept in the first one for the list itself: an append costs the same always.
  struct QAZLLNode* last;
} QAZLLNode;

// Decides where data goes in a platform that sorts; this one appends always and doesn't call it.
typedef int (*QAZLLCompare)(const void* listed, const void* added);

// Appends `data` to the list at `*head` (null: empty). 0, or -1 for a null argument or without
// memory; `data` is then still the caller's.
int QAZLLadd(QAZLLNode** head, void* data, QAZLLCompare compare);
// Empties the head, calls `release` (may be null) on the data of every node, in order, and frees
// the nodes.
void QAZLLfree(QAZLLNode** head, void (*release)(void* data));

#ifdef __cplusplus
}
#endif

#endif
