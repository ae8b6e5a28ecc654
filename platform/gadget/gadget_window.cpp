#include "gadget_window.h"

namespace {

Evas_Object *registered_window;

void forget_window(void *, Evas *, Evas_Object *win, void *)
{
	if (registered_window == win)
		registered_window = nullptr;
}

} // namespace

extern "C" void ug_set_window(Evas_Object *win)
{
	if (registered_window)
		evas_object_event_callback_del(registered_window, EVAS_CALLBACK_DEL, forget_window);
	registered_window = win;
	if (win)
		evas_object_event_callback_add(win, EVAS_CALLBACK_DEL, forget_window, nullptr);
}

extern "C" Evas_Object *ug_get_window(void)
{
	return registered_window;
}
