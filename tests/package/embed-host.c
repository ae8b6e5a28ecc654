/* A host as the README shows one, built against the installed packages
 * through pkg-config alone. */
#include <Elementary.h>
#include <editor-svc.h>

static void destroy_editor(void *editor)
{
	IE_destroy(editor);
}

static void on_delete_me(void *data, Evas_Object *view, void *event_info)
{
	char *saved = event_info;
	(void)view;
	free(saved);
	ecore_job_add(destroy_editor, data);
	elm_exit();
}

int main(int argc, char **argv)
{
	if (argc < 2)
		return 2;
	elm_init(argc, argv);
	Evas_Object *win = elm_win_util_standard_add("viewer", "Viewer");
	Evas_Object *box = elm_box_add(win);
	elm_win_resize_object_add(win, box);
	Viewhandle *editor = IE_create(box);
	if (editor) {
		IE_setparam(editor, argv[1], 720, 1280, 0);
		Evas_Object *view = IE_get_view_object(editor);
		evas_object_smart_callback_add(view, "delete,me", on_delete_me, editor);
		elm_box_pack_end(box, view);
		evas_object_show(win);
		elm_run();
	}
	elm_shutdown();
	return 0;
}
