#include "ie-idler.h"

#include <cstdlib>

#include <Eina.h>

namespace {

struct Pending_Idler {
	Viewhandle *vh;
	Ecore_Task_Cb func;
	Ecore_Idler *idler;
};

Eina_List *pending;

Eina_Bool run_pending(void *data)
{
	auto *entry = static_cast<Pending_Idler *>(data);
	pending = eina_list_remove(pending, entry);
	Viewhandle *vh = entry->vh;
	Ecore_Task_Cb func = entry->func;
	free(entry);
	func(vh);
	return ECORE_CALLBACK_CANCEL;
}

} // namespace

void ie_idler_add(Viewhandle *vh, Ecore_Task_Cb func)
{
	auto *entry = static_cast<Pending_Idler *>(calloc(1, sizeof(Pending_Idler)));
	if (!entry)
		return;
	entry->vh = vh;
	entry->func = func;
	entry->idler = ecore_idler_add(run_pending, entry);
	if (!entry->idler) {
		free(entry);
		return;
	}
	pending = eina_list_append(pending, entry);
}

void ie_idlers_cancel(Viewhandle *vh)
{
	Eina_List *node, *next;
	void *data;
	EINA_LIST_FOREACH_SAFE(pending, node, next, data) {
		auto *entry = static_cast<Pending_Idler *>(data);
		if (entry->vh != vh)
			continue;
		ecore_idler_del(entry->idler);
		pending = eina_list_remove_list(pending, node);
		free(entry);
	}
}
