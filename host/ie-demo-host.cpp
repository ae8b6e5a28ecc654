/* A photo viewer's view of the editor: a window registered as the gadget
 * window, IE_create, IE_setparam on a picture, the editor's layout embedded,
 * and IE_destroy when the editor asks to be closed.
 *
 * With a display the window is interactive. Without one (or with
 * --headless) it runs on the buffer engine, optionally plays a script of
 * taps on the editor's real buttons and tools (--do ACTION, repeatable), and
 * writes a screenshot of the window at the end (--screenshot PATH;
 * --shots DIR writes one after every step as well). */
#include <Elementary.h>
#include <libintl.h>
#include <unistd.h>

#include <clocale>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <string>
#include <vector>

#include <editor-svc.h>
#include <gadget_window.h>

#include "ie-demo-script.h"

namespace {

struct Options {
	std::string picture = IE_SAMPLE_PICTURE;
	std::vector<std::string> actions;
	std::string screenshot;
	std::string shots_dir;
	int width = 720, height = 1280, rotation = 0;
	bool headless = false;
};

struct Host {
	Options options;
	Evas_Object *win = nullptr;
	Viewhandle *editor = nullptr;
	bool closed = false;
	/* The editor closed before its picture ever showed. */
	bool not_opened = false;
	std::string saved_path;
};

/* Installed, the demo goes by another name than in the build tree. */
void usage(const char *program)
{
	const char *slash = strrchr(program, '/');
	fprintf(stderr,
		"usage: %s [picture] [--headless] [--size WxH] [--rotation DEG]\n"
		"       [--do ACTION]... [--screenshot PATH] [--shots DIR]\n"
		"actions: %s\n",
		slash ? slash + 1 : program, demo_actions_help());
}

bool parse(int argc, char **argv, Options *o)
{
	for (int i = 1; i < argc; i++) {
		std::string arg = argv[i];
		auto value = [&](std::string *out) {
			if (i + 1 >= argc)
				return false;
			*out = argv[++i];
			return true;
		};
		std::string v;
		if (arg == "--headless") {
			o->headless = true;
		} else if (arg == "--do" && value(&v)) {
			o->actions.push_back(v);
		} else if (arg == "--screenshot" && value(&v)) {
			o->screenshot = v;
		} else if (arg == "--shots" && value(&v)) {
			o->shots_dir = v;
		} else if (arg == "--size" && value(&v)) {
			if (sscanf(v.c_str(), "%dx%d", &o->width, &o->height) != 2 || o->width <= 0 || o->height <= 0)
				return false;
		} else if (arg == "--rotation" && value(&v)) {
			o->rotation = atoi(v.c_str());
		} else if (!arg.empty() && arg[0] != '-') {
			o->picture = arg;
		} else {
			return false;
		}
	}
	return true;
}

/* The demo's own data (platform databases, default screenshot): inside the
 * build tree, or, installed, in the user's data directory, since the
 * system's directories are not the user's to write. */
const std::string &demo_data_dir()
{
	static const std::string dir = [] {
#ifdef IE_DEMO_DATA_DIR
		std::string path = IE_DEMO_DATA_DIR;
#else
		const char *data_home = getenv("XDG_DATA_HOME");
		const char *home = getenv("HOME");
		std::string path = data_home && *data_home ? std::string(data_home)
			: std::string(home && *home ? home : "/tmp") + "/.local/share";
		path += "/editor-svc-demo";
#endif
		std::error_code ignored;
		std::filesystem::create_directories(path, ignored);
		return path;
	}();
	return dir;
}

/* Where the platform services keep their data when the caller said nothing:
 * in the demo's data directory, not in the system's directories. */
void default_platform_paths()
{
	const std::string &data_dir = demo_data_dir();
	setenv("MEDIA_DB_PATH", (data_dir + "/media.db").c_str(), 0);
	setenv("VANTRIC_LOG_DB", (data_dir + "/vantric-log.db").c_str(), 0);
	setenv("STORAGE_INTERNAL_ROOT", "/", 0);
	setenv("APP_LAUNCH_DIR", (data_dir + "/launchers").c_str(), 0);
}

void headless_environment()
{
	setenv("ELM_ENGINE", "buffer", 1);
	setenv("ECORE_EVAS_FORCE_SYNC_RENDER", "1", 1);
	setenv("ECORE_EVAS_RENDER_NOSYNC", "1", 1);
	setenv("ECORE_NO_SYSTEM_MODULES", "1", 0);
	setenv("EINA_LOG_BACKTRACE", "-1", 0);
	setenv("EINA_LOG_LEVELS", "ecore_con:0", 0);
	setenv("ELM_PROFILE_NOSAVE", "1", 0);
}

/* The editor's picture holds pixels: it has been on screen. */
bool picture_shown(Evas_Object *win)
{
	Evas_Object *image = evas_object_name_find(evas_object_evas_get(win), "mImage");
	int w = 0, h = 0;
	if (image)
		evas_object_image_size_get(image, &w, &h);
	return w > 0 && h > 0 && evas_object_image_data_get(image, EINA_FALSE);
}

/* A null path before the picture ever showed is the only word the editor
 * gives of a picture it could not open. */
void on_delete_me(void *data, Evas_Object *, void *event_info)
{
	auto *host = static_cast<Host *>(data);
	host->closed = true;
	auto *path = static_cast<char *>(event_info);
	if (path) {
		host->saved_path = path;
		printf("saved: %s\n", path);
		free(path);
	} else if (!picture_shown(host->win)) {
		host->not_opened = true;
		printf("closed: the picture could not be opened: %s; nothing saved\n", host->options.picture.c_str());
	} else {
		printf("closed: nothing saved\n");
	}
	fflush(stdout);
	if (!host->options.headless)
		elm_exit();
}

void on_window_closed(void *, Evas_Object *, void *)
{
	elm_exit();
}

} // namespace

int main(int argc, char **argv)
{
	Host host;
	if (!parse(argc, argv, &host.options)) {
		usage(argv[0]);
		return 2;
	}
	Options &o = host.options;
	if (!getenv("DISPLAY") && !getenv("WAYLAND_DISPLAY"))
		o.headless = true;
	if (!o.headless && (!o.actions.empty() || !o.screenshot.empty()))
		o.headless = true;
	if (o.headless) {
		headless_environment();
		if (o.screenshot.empty())
			o.screenshot = demo_data_dir() + "/editor.png";
	}
	default_platform_paths();
	// gettext ignores catalogues in the C locale.
	const char *lang = getenv("LANG");
	if (!lang || !*lang || !strcmp(lang, "C") || !strcmp(lang, "POSIX"))
		setenv("LANG", "C.UTF-8", 1);
	setenv("LANGUAGE", "en", 0);
	setlocale(LC_ALL, "");

	elm_init(argc, argv);
	if (!o.shots_dir.empty())
		ecore_file_mkpath(o.shots_dir.c_str());
	bindtextdomain("marlune", IE_DEMO_LOCALE_DIR);
	elm_policy_set(ELM_POLICY_QUIT, ELM_POLICY_QUIT_LAST_WINDOW_CLOSED);

	host.win = elm_win_util_standard_add("ie-demo-host", "Photo editor");
	evas_object_smart_callback_add(host.win, "delete,request", on_window_closed, nullptr);
	evas_object_resize(host.win, o.width, o.height);
	elm_win_rotation_set(host.win, o.rotation);
	ug_set_window(host.win);

	Evas_Object *box = elm_box_add(host.win);
	evas_object_size_hint_weight_set(box, EVAS_HINT_EXPAND, EVAS_HINT_EXPAND);
	elm_win_resize_object_add(host.win, box);
	evas_object_show(box);

	host.editor = IE_create(box);
	if (!host.editor) {
		fprintf(stderr, "ie-demo-host: the editor could not be created\n");
		elm_shutdown();
		return 1;
	}
	Evas_Object *view = IE_get_view_object(host.editor);
	evas_object_smart_callback_add(view, "delete,me", on_delete_me, &host);
	IE_setparam(host.editor, o.picture.c_str(), o.width, o.height, 0);
	elm_box_pack_end(box, view);
	evas_object_show(host.win);

	int status = 0;
	if (o.headless) {
		Demo_Script script = {host.win, view, &host.closed, o.shots_dir};
		status = demo_script_run(&script, o.actions) && !host.not_opened ? 0 : 1;
		if (!host.not_opened && demo_screenshot(host.win, o.screenshot.c_str()))
			printf("screenshot: %s\n", o.screenshot.c_str());
	} else {
		elm_run();
		status = host.not_opened ? 1 : 0;
	}

	IE_destroy(host.editor);
	evas_object_del(host.win);
	elm_shutdown();
	return status;
}
