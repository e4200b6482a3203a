/*
 * The closed video library (libzmf): start-up, the one event listener, and
 * its JSON helper, as the system calls them.
 */
#ifndef QUELLBORN_PLATFORM_ZMF_H
#define QUELLBORN_PLATFORM_ZMF_H

#ifdef __cplusplus
extern "C" {
#endif

/* Called on the library's own thread with an event number, the event's JSON
 * text and an argument the system does not use. */
typedef void (*ZmfVideoListener)(int iEvent, const char* pcJson, int iArg);

int Zmf_OnIntialize(void);
int Zmf_OnTerminate(void);
/* Registers the one listener; null removes it. */
int Zmf_VideoSetListener(ZmfVideoListener pfnListener);
/* Printable name of an event; never null. */
const char* Zmf_GetEventName(int iEvent);
/* Fills the destinations after pcFormat from the JSON text by the template:
 * %s a text, copied up to the next quote with no bound on its length (texts
 * the library hands out fit ZMF_JSON_TEXT_SIZE bytes), %d an int, %ld a long.
 * Returns the number of values filled. */
int Zmf_ScanfJson(const char* pcJson, const char* pcFormat, ...);

#define ZMF_JSON_TEXT_SIZE 512

#ifdef __cplusplus
}
#endif

#endif /* QUELLBORN_PLATFORM_ZMF_H */
