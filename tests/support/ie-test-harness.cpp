#include "ie-test-harness.h"

#include <platform_log.h>
#include <gadget_window.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>

#include "ie-test-internal.h"

namespace iet {

namespace {

// A fake event clock that only grows: the gesture layer compares event
// timestamps, not real time.
unsigned int event_clock = 100000;

unsigned int tick(unsigned int ms = 10)
{
	event_clock += ms;
	return event_clock;
}

Evas *canvas_of(Evas_Object *win)
{
	return evas_object_evas_get(win);
}

std::vector<std::string> &scratch_dirs()
{
	static std::vector<std::string> dirs;
	return dirs;
}

Evas_Object *current_window;

} // namespace

void EflTest::SetUp()
{
	efl_errors_clear();
	allowed_efl_errors().clear();
	log_clear();
	win_ = elm_win_add(nullptr, "ie-test", ELM_WIN_BASIC);
	ASSERT_NE(win_, nullptr);
	elm_win_autodel_set(win_, EINA_FALSE);
	Evas_Object *bg = elm_bg_add(win_);
	evas_object_size_hint_weight_set(bg, EVAS_HINT_EXPAND, EVAS_HINT_EXPAND);
	elm_win_resize_object_add(win_, bg);
	evas_object_show(bg);
	evas_object_resize(win_, win_w, win_h);
	evas_object_show(win_);
	ug_set_window(win_);
	current_window = win_;
	settle();
}

void EflTest::TearDown()
{
	if (win_) {
		evas_object_del(win_);
		win_ = nullptr;
	}
	current_window = nullptr;
	run_idlers();
	for (const auto &line : efl_errors()) {
		bool allowed = false;
		for (const auto &text : allowed_efl_errors())
			allowed = allowed || line.find(text) != std::string::npos;
		if (!allowed)
			ADD_FAILURE() << "unexpected EFL error: " << line;
	}
	for (const auto &dir : scratch_dirs()) {
		std::error_code ignored;
		std::filesystem::remove_all(dir, ignored);
	}
	scratch_dirs().clear();
}

void EflTest::resize_window(int w, int h)
{
	win_w = w;
	win_h = h;
	evas_object_resize(win_, w, h);
	settle();
}

void EflTest::allow_efl_error(const std::string &text)
{
	allowed_efl_errors().push_back(text);
}

void settle()
{
	for (int pass = 0; pass < 4; pass++) {
		ecore_main_loop_iterate();
		edje_message_signal_process();
		if (current_window)
			evas_smart_objects_calculate(canvas_of(current_window));
	}
}

bool run_until(const std::function<bool()> &done, double timeout)
{
	struct Poll {
		const std::function<bool()> *done;
		double deadline;
		bool held;
	} poll = {&done, ecore_time_get() + timeout, false};

	if (done())
		return true;
	// The poll timer removes itself when it ends the loop.
	ecore_timer_add(0.001, [](void *data) -> Eina_Bool {
		auto *p = static_cast<Poll *>(data);
		p->held = (*p->done)();
		if (p->held || ecore_time_get() >= p->deadline) {
			ecore_main_loop_quit();
			return ECORE_CALLBACK_CANCEL;
		}
		return ECORE_CALLBACK_RENEW;
	}, &poll);
	ecore_main_loop_begin();
	edje_message_signal_process();
	if (current_window)
		evas_smart_objects_calculate(canvas_of(current_window));
	return poll.held;
}

void run_for(double seconds)
{
	run_until([] { return false; }, seconds);
}

void run_idlers()
{
	// Idlers run in the order they were added, so a marker idler added now
	// runs after every idler already pending; three rounds also catch
	// idlers and jobs that the first ones schedule.
	for (int round = 0; round < 3; round++) {
		bool ran = false;
		ecore_idler_add([](void *data) -> Eina_Bool {
			*static_cast<bool *>(data) = true;
			return ECORE_CALLBACK_CANCEL;
		}, &ran);
		run_until([&ran] { return ran; }, 5.0);
	}
	settle();
}

void mouse_move(Evas_Object *win, int x, int y)
{
	evas_event_feed_mouse_move(canvas_of(win), x, y, tick(), nullptr);
}

void mouse_down(Evas_Object *win, int x, int y)
{
	mouse_move(win, x, y);
	evas_event_feed_mouse_down(canvas_of(win), 1, EVAS_BUTTON_NONE, tick(), nullptr);
}

void mouse_up(Evas_Object *win, int x, int y)
{
	mouse_move(win, x, y);
	evas_event_feed_mouse_up(canvas_of(win), 1, EVAS_BUTTON_NONE, tick(), nullptr);
}

void tap(Evas_Object *win, int x, int y)
{
	mouse_down(win, x, y);
	evas_event_feed_mouse_up(canvas_of(win), 1, EVAS_BUTTON_NONE, tick(), nullptr);
	// Buttons click from an Edje program: let it run.
	settle();
}

void tap_object(Evas_Object *obj)
{
	settle();
	int x, y;
	object_centre(obj, &x, &y);
	tap(obj, x, y);
}

void double_tap(Evas_Object *win, int x, int y)
{
	Evas *e = canvas_of(win);
	evas_event_feed_mouse_move(e, x, y, tick(), nullptr);
	evas_event_feed_mouse_down(e, 1, EVAS_BUTTON_NONE, tick(40), nullptr);
	evas_event_feed_mouse_up(e, 1, EVAS_BUTTON_NONE, tick(40), nullptr);
	evas_event_feed_mouse_down(e, 1, EVAS_BUTTON_NONE, tick(60), nullptr);
	evas_event_feed_mouse_up(e, 1, EVAS_BUTTON_NONE, tick(40), nullptr);
	settle();
}

void drag(Evas_Object *win, int x0, int y0, int x1, int y1, int steps)
{
	Evas *e = canvas_of(win);
	mouse_down(win, x0, y0);
	for (int i = 1; i <= steps; i++) {
		int x = x0 + (x1 - x0) * i / steps;
		int y = y0 + (y1 - y0) * i / steps;
		evas_event_feed_mouse_move(e, x, y, tick(), nullptr);
		edje_message_signal_process();
	}
	evas_event_feed_mouse_up(e, 1, EVAS_BUTTON_NONE, tick(), nullptr);
	settle();
}

namespace {

void multi_down(Evas *e, int x, int y)
{
	evas_event_feed_multi_down(e, 1, x, y, 1, 1, 1, 1, 0, x, y, EVAS_BUTTON_NONE, tick(), nullptr);
}

void multi_move(Evas *e, int x, int y)
{
	evas_event_feed_multi_move(e, 1, x, y, 1, 1, 1, 1, 0, x, y, tick(), nullptr);
}

void multi_up(Evas *e, int x, int y)
{
	evas_event_feed_multi_up(e, 1, x, y, 1, 1, 1, 1, 0, x, y, EVAS_BUTTON_NONE, tick(), nullptr);
}

} // namespace

void pinch(Evas_Object *win, int cx, int cy, int gap0, int gap1, int steps)
{
	Evas *e = canvas_of(win);
	mouse_down(win, cx - gap0 / 2, cy);
	multi_down(e, cx + gap0 / 2, cy);
	int gap = gap0;
	for (int i = 1; i <= steps; i++) {
		gap = gap0 + (gap1 - gap0) * i / steps;
		evas_event_feed_mouse_move(e, cx - gap / 2, cy, tick(), nullptr);
		multi_move(e, cx + gap / 2, cy);
		edje_message_signal_process();
	}
	multi_up(e, cx + gap / 2, cy);
	evas_event_feed_mouse_up(e, 1, EVAS_BUTTON_NONE, tick(), nullptr);
	settle();
}

void two_finger_drag(Evas_Object *win, int x, int y, int gap, int dx, int dy, int steps)
{
	Evas *e = canvas_of(win);
	mouse_down(win, x, y);
	multi_down(e, x + gap, y);
	for (int i = 1; i <= steps; i++) {
		int ox = dx * i / steps, oy = dy * i / steps;
		evas_event_feed_mouse_move(e, x + ox, y + oy, tick(), nullptr);
		multi_move(e, x + gap + ox, y + oy);
		edje_message_signal_process();
	}
	multi_up(e, x + gap + dx, y + dy);
	evas_event_feed_mouse_up(e, 1, EVAS_BUTTON_NONE, tick(), nullptr);
	settle();
}

void finger_down(Evas_Object *win, int finger, int x, int y)
{
	if (finger == 0) {
		mouse_down(win, x, y);
		return;
	}
	Evas *e = canvas_of(win);
	evas_event_feed_multi_down(e, finger, x, y, 1, 1, 1, 1, 0, x, y, EVAS_BUTTON_NONE, tick(), nullptr);
}

void finger_move(Evas_Object *win, int finger, int x, int y)
{
	Evas *e = canvas_of(win);
	if (finger == 0)
		evas_event_feed_mouse_move(e, x, y, tick(), nullptr);
	else
		evas_event_feed_multi_move(e, finger, x, y, 1, 1, 1, 1, 0, x, y, tick(), nullptr);
}

void finger_up(Evas_Object *win, int finger, int x, int y)
{
	if (finger == 0) {
		mouse_up(win, x, y);
		return;
	}
	Evas *e = canvas_of(win);
	evas_event_feed_multi_up(e, finger, x, y, 1, 1, 1, 1, 0, x, y, EVAS_BUTTON_NONE, tick(), nullptr);
}

void key_press(Evas_Object *win, const char *keyname)
{
	Evas *e = canvas_of(win);
	evas_event_feed_key_down(e, keyname, keyname, nullptr, nullptr, tick(), nullptr);
	evas_event_feed_key_up(e, keyname, keyname, nullptr, nullptr, tick(), nullptr);
	settle();
}

void object_centre(Evas_Object *obj, int *x, int *y)
{
	Evas_Coord ox, oy, ow, oh;
	evas_object_geometry_get(obj, &ox, &oy, &ow, &oh);
	*x = ox + ow / 2;
	*y = oy + oh / 2;
}

uint32_t screen_pixel(Evas_Object *win, int x, int y)
{
	Ecore_Evas *ee = ecore_evas_ecore_evas_get(canvas_of(win));
	int w = 0, h = 0;
	ecore_evas_geometry_get(ee, nullptr, nullptr, &w, &h);
	auto *pixels = static_cast<const uint32_t *>(ecore_evas_buffer_pixels_get(ee));
	EXPECT_TRUE(pixels && x >= 0 && y >= 0 && x < w && y < h) << x << "," << y << " on " << w << "x" << h;
	return pixels && x >= 0 && y >= 0 && x < w && y < h ? pixels[static_cast<size_t>(y) * w + x] : 0;
}

std::vector<LogLine> log_lines()
{
	std::vector<LogLine> lines;
	for (size_t i = 0; i < platform_log_record_count(); i++)
		lines.push_back({platform_log_record_priority(i), platform_log_record_tag(i), platform_log_record_text(i)});
	return lines;
}

void log_clear()
{
	platform_log_record_clear();
}

namespace {

// "file: func(line) > \033[31mmessage\033[0m" -> "message".
std::string message_of(const std::string &text)
{
	size_t start = text.find(") > ");
	start = (start == std::string::npos) ? 0 : start + 4;
	if (text.compare(start, 1, "\033") == 0) {
		size_t m = text.find('m', start);
		if (m != std::string::npos)
			start = m + 1;
	}
	std::string message = text.substr(start);
	const std::string reset = "\033[0m";
	if (message.size() >= reset.size() && message.compare(message.size() - reset.size(), reset.size(), reset) == 0)
		message.resize(message.size() - reset.size());
	return message;
}

} // namespace

std::vector<std::string> log_messages()
{
	std::vector<std::string> messages;
	for (const auto &line : log_lines())
		messages.push_back(message_of(line.text));
	return messages;
}

int log_count(const std::string &message, int priority)
{
	int count = 0;
	for (const auto &line : log_lines())
		if ((priority == 0 || line.priority == priority) && message_of(line.text) == message)
			count++;
	return count;
}

std::string temp_dir()
{
	std::string pattern = (std::filesystem::temp_directory_path() / "ie-test-XXXXXX").string();
	if (!mkdtemp(pattern.data()))
		return {};
	scratch_dirs().push_back(pattern);
	return pattern;
}

bool write_picture(const std::string &path, int w, int h, const char *flags)
{
	Ecore_Evas *ee = ecore_evas_buffer_new(1, 1);
	if (!ee)
		return false;
	Evas_Object *img = evas_object_image_filled_add(ecore_evas_get(ee));
	evas_object_image_alpha_set(img, EINA_FALSE);
	evas_object_image_size_set(img, w, h);
	auto *pixels = static_cast<uint32_t *>(evas_object_image_data_get(img, EINA_TRUE));
	bool saved = false;
	if (pixels) {
		int mark = std::max(1, std::min(w, h) / 8);
		for (int y = 0; y < h; y++)
			for (int x = 0; x < w; x++) {
				uint32_t r = w > 1 ? x * 255 / (w - 1) : 0;
				uint32_t g = h > 1 ? y * 255 / (h - 1) : 0;
				uint32_t b = (x < mark && y < mark) ? 255 : 96;
				if (x < mark && y < mark)
					r = g = 255;
				pixels[y * w + x] = 0xff000000u | r << 16 | g << 8 | b;
			}
		evas_object_image_data_set(img, pixels);
		evas_object_image_data_update_add(img, 0, 0, w, h);
		saved = evas_object_image_save(img, path.c_str(), nullptr, flags);
	}
	evas_object_del(img);
	ecore_evas_free(ee);
	return saved;
}

} // namespace iet
