/* One-shot idlers that carry an editor record as their data. They are
 * tracked per record so that IE_destroy can delete those still pending:
 * none may run on a freed record. */
#ifndef IE_IDLER_H
#define IE_IDLER_H

#include <Ecore.h>

#include "editor-svc.h"

/* Runs `func(vh)` once when the main loop is next idle; the idler ends
 * after one run whatever `func` returns. */
void ie_idler_add(Viewhandle *vh, Ecore_Task_Cb func);
/* Deletes every pending idler of `vh`. */
void ie_idlers_cancel(Viewhandle *vh);

#endif
