/* Headless EFL test harness: the real Elementary on the buffer engine, one
 * elm_init per test binary, a fresh window per test, real input events fed
 * on the window's canvas, and the main loop run the way the toolkit runs it.
 *
 * A test binary that links ie-test-support gets a main() that prepares the
 * environment; UI tests derive from iet::EflTest. */
#ifndef IE_TEST_HARNESS_H
#define IE_TEST_HARNESS_H

#include <Elementary.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

namespace iet {

/* A window (registered as the gadget window, rotation 0) of the given size
 * per test; fails the test on any EFL error line it did not expect, and
 * deletes the window and settles the loop afterwards. */
class EflTest : public ::testing::Test {
protected:
	void SetUp() override;
	void TearDown() override;

	Evas_Object *win() const { return win_; }
	Evas *evas() const { return evas_object_evas_get(win_); }
	/* Window size for this test; call from the derived SetUp before
	 * EflTest::SetUp, or resize later with resize_window(). */
	int win_w = 720, win_h = 1280;
	void resize_window(int w, int h);

	/* An EFL error line containing `text` is expected (not a failure). */
	void allow_efl_error(const std::string &text);

private:
	Evas_Object *win_ = nullptr;
};

/* Lays out everything: one iterate, smart calculation, pending Edje
 * signals and messages, and again until nothing changes. */
void settle();
/* Runs the main loop (idlers included) until `done` holds or `timeout`
 * seconds pass; returns whether `done` held. */
bool run_until(const std::function<bool()> &done, double timeout = 5.0);
/* Runs the main loop for `seconds` of real time, idlers included. */
void run_for(double seconds);
/* Runs the main loop until every pending idler, job and zero timer ran. */
void run_idlers();

/* Input on the canvas of `win` (any object of that canvas will do), with a
 * growing fake clock. */
void mouse_move(Evas_Object *win, int x, int y);
void mouse_down(Evas_Object *win, int x, int y);
void mouse_up(Evas_Object *win, int x, int y);
void tap(Evas_Object *win, int x, int y);
/* Taps the centre of `obj` (after settling the layout). */
void tap_object(Evas_Object *obj);
void double_tap(Evas_Object *win, int x, int y);
/* One-finger drag in `steps` moves, 10 ms apart. */
void drag(Evas_Object *win, int x0, int y0, int x1, int y1, int steps = 10);
/* Two fingers centred at (cx, cy), horizontally `gap0` apart, spread to
 * `gap1` in `steps` moves. */
void pinch(Evas_Object *win, int cx, int cy, int gap0, int gap1, int steps = 10);
/* Two fingers `gap` apart moved together by (dx, dy). */
void two_finger_drag(Evas_Object *win, int x, int y, int gap, int dx, int dy, int steps = 10);
/* Single touch points, for gestures the helpers above do not make: finger
 * 0 is the mouse, any other number a further touch point. Each call is one
 * event. */
void finger_down(Evas_Object *win, int finger, int x, int y);
void finger_move(Evas_Object *win, int finger, int x, int y);
void finger_up(Evas_Object *win, int finger, int x, int y);
/* A key press and release on the window ("Escape", "XF86Back", ...). */
void key_press(Evas_Object *win, const char *keyname);

/* Centre of an object's geometry. */
void object_centre(Evas_Object *obj, int *x, int *y);

/* The pixel at (x, y) of the window as drawn now (rendered first):
 * premultiplied ARGB. */
uint32_t screen_pixel(Evas_Object *win, int x, int y);

/* Platform log record. */
struct LogLine {
	int priority;
	std::string tag;
	std::string text;
};
std::vector<LogLine> log_lines();
void log_clear();
/* Number of recorded lines whose message (between the "> " prefix's colour
 * and the reset) is exactly `message`, at `priority` (any when 0). */
int log_count(const std::string &message, int priority = 0);
/* Messages of the recorded lines, in order, colour codes stripped. */
std::vector<std::string> log_messages();

/* A scratch directory removed when the test ends. */
std::string temp_dir();

/* Writes a test picture with Evas's savers (format from the extension):
 * a smooth colour gradient with a marked corner, so orientation shows. */
bool write_picture(const std::string &path, int w, int h, const char *flags = nullptr);

} // namespace iet

#endif
