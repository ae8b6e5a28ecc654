/* An editor embedded in a headless window as a photo viewer embeds it, with
 * its "delete,me" requests recorded. */
#ifndef EDITOR_FIXTURE_H
#define EDITOR_FIXTURE_H

#include <string>
#include <vector>

#include "editor-svc-private.h"
#include "ie-test-harness.h"

class EditorTest : public iet::EflTest {
protected:
	void TearDown() override;

	/* IE_create on a box in the window, with the "delete,me" listener. */
	Viewhandle *create_editor();
	/* create_editor + a w x h JPEG written in a scratch directory +
	 * IE_setparam, then the loop run until the picture is in place. */
	Viewhandle *open_editor_on_picture(int w, int h, int rotation = 0);
	/* create_editor + IE_setparam on `path`, then the loop run until the
	 * picture is in place. */
	Viewhandle *open_editor_on_file(const std::string &path, int rotation = 0);
	void destroy_editor();
	/* Runs the loop until the editor asks to be closed (a save registers
	 * its file before it does); whether it did within `timeout` seconds. */
	bool wait_for_close(double timeout = 10.0);

	/* The tool bar's item `index`, NULL past the last. */
	Elm_Object_Item *tool(int index) const;
	/* Taps a grid item where it is on screen, the loop settled first. */
	void tap_item(Elm_Object_Item *item);
	void tap_tool(int index) { tap_item(tool(index)); }

	Evas_Object *inner_image() const;
	void picture_size(int *w, int *h) const;
	std::vector<uint32_t> picture_pixels() const;

	Viewhandle *vh = nullptr;
	std::string picture_dir;
	std::string picture_path;
	/* Every "delete,me": its path, or "" for NULL. */
	std::vector<std::string> close_requests;

private:
	static void on_delete_me(void *data, Evas_Object *, void *event_info);
	Evas_Object *box_ = nullptr;
};

#endif
