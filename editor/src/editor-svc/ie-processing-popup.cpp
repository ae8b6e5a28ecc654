/*
 * The popup with a pulsing bar shown while the editor works longer than a
 * person waits without a sign: opening a large picture, registering a save.
 */

#include <Elementary.h>

#include "editor-svc-private.h"

/* The back key waits for the work: there is nothing to go back to yet. */
static void _processing_popup_back_cb(void *data, Evas_Object *obj, void *event_info)
{
	(void)data;
	(void)obj;
	(void)event_info;
}

Evas_Object *ie_processing_popup_add(Evas_Object *parent, const char *text_id)
{
	Evas_Object *popup = elm_popup_add(parent);
	if (!popup) {
		IE_LOG_E("Cannot create processing popup");
		return NULL;
	}
	elm_object_style_set(popup, "image-editor");
	elm_popup_align_set(popup, ELM_NOTIFY_ALIGN_FILL, 1.0);
	ea_object_event_callback_add(popup, EA_CALLBACK_BACK, _processing_popup_back_cb, NULL);
	evas_object_size_hint_weight_set(popup, EVAS_HINT_EXPAND, EVAS_HINT_EXPAND);

	Evas_Object *layout = elm_layout_add(popup);
	if (!elm_layout_file_set(layout, IE_EDJ_FILE, "processing_view_layout"))
		IE_LOG_E("Layout file set failed! %s in %s", "processing_view_layout", IE_EDJ_FILE);
	evas_object_size_hint_weight_set(layout, EVAS_HINT_EXPAND, EVAS_HINT_EXPAND);
	elm_object_domain_translatable_part_text_set(layout, "elm.text", IE_TEXT_DOMAIN, text_id);

	Evas_Object *progressbar = elm_progressbar_add(layout);
	elm_object_style_set(progressbar, "process_medium");
	evas_object_size_hint_align_set(progressbar, EVAS_HINT_FILL, 0.5);
	evas_object_size_hint_weight_set(progressbar, EVAS_HINT_EXPAND, EVAS_HINT_EXPAND);
	/* Pulsing needs pulse mode first; without it the bar stands still. */
	elm_progressbar_pulse_set(progressbar, EINA_TRUE);
	elm_progressbar_pulse(progressbar, EINA_TRUE);
	elm_object_part_content_set(layout, "processing", progressbar);

	elm_object_part_content_set(popup, NULL, layout);
	evas_object_data_set(popup, "progressbar", progressbar);
	evas_object_show(popup);
	return popup;
}
