/* Scripted use of the editor through its real widgets: each action taps a
 * tool, an effect thumbnail, a function-bar button or a popup button where
 * it is on screen, drags a finger over the picture or the effect strip, or
 * presses a key, then lets the main loop run. */
#ifndef IE_DEMO_SCRIPT_H
#define IE_DEMO_SCRIPT_H

#include <Elementary.h>

#include <string>
#include <vector>

struct Demo_Script {
	Evas_Object *win;
	Evas_Object *editor_view;
	const bool *closed;
	std::string shots_dir;
};

const char *demo_actions_help(void);
/* Waits for the picture, then plays the actions; false on an unknown
 * action or one whose target is not on screen. */
bool demo_script_run(Demo_Script *script, const std::vector<std::string> &actions);
/* Renders the window and writes it as a PNG. */
bool demo_screenshot(Evas_Object *win, const char *path);

#endif
