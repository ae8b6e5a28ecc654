#include "app_launch.h"

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <mutex>
#include <new>
#include <spawn.h>
#include <string>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>
#include <utility>
#include <vector>

extern char **environ;

struct App_Request {
	std::string operation;
	std::string app_id;
	unsigned int window = 0;
	std::vector<std::pair<std::string, std::string>> extra_data;
};

namespace {

constexpr char default_launcher_dir[] = "/usr/share/app-control/launchers";

// Launchers run on their own; their exit status is collected on later
// launches so that they do not stay behind as zombies. Only our own
// children are waited for: the host may have children of its own.
std::mutex launched_lock;
std::vector<pid_t> launched;

void reap_finished_launchers()
{
	std::lock_guard<std::mutex> hold(launched_lock);
	for (auto it = launched.begin(); it != launched.end();) {
		pid_t done = waitpid(*it, nullptr, WNOHANG);
		// ECHILD: someone else (Ecore's SIGCHLD handler) already reaped it.
		if (done == *it || (done < 0 && errno == ECHILD))
			it = launched.erase(it);
		else
			++it;
	}
}

std::string launcher_dir()
{
	const char *dir = getenv("APP_LAUNCH_DIR");
	return (dir && *dir) ? dir : default_launcher_dir;
}

// The app id becomes a file name in the launcher directory, so it must not
// be able to name anything outside it.
bool app_id_is_safe(const std::string &app_id)
{
	if (app_id.empty() || app_id == "." || app_id == "..")
		return false;
	for (char c : app_id) {
		bool allowed = (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') ||
			       c == '.' || c == '-' || c == '_';
		if (!allowed)
			return false;
	}
	return true;
}

bool is_executable_file(const std::string &path)
{
	struct stat st;
	return stat(path.c_str(), &st) == 0 && S_ISREG(st.st_mode) && access(path.c_str(), X_OK) == 0;
}

int copy_out(const std::string &value, char **out)
{
	if (!out)
		return APP_LAUNCH_ERROR_INVALID_PARAMETER;
	if (value.empty()) {
		*out = nullptr;
		return APP_LAUNCH_ERROR_NONE;
	}
	*out = strdup(value.c_str());
	return *out ? APP_LAUNCH_ERROR_NONE : APP_LAUNCH_ERROR_OUT_OF_MEMORY;
}

} // namespace

extern "C" int app_control_create(App_Request **app_control)
{
	if (!app_control)
		return APP_LAUNCH_ERROR_INVALID_PARAMETER;
	*app_control = new (std::nothrow) App_Request();
	return *app_control ? APP_LAUNCH_ERROR_NONE : APP_LAUNCH_ERROR_OUT_OF_MEMORY;
}

extern "C" int app_control_destroy(App_Request *app_control)
{
	if (!app_control)
		return APP_LAUNCH_ERROR_INVALID_PARAMETER;
	delete app_control;
	return APP_LAUNCH_ERROR_NONE;
}

extern "C" int app_control_set_operation(App_Request *app_control, const char *operation)
{
	if (!app_control)
		return APP_LAUNCH_ERROR_INVALID_PARAMETER;
	app_control->operation = operation ? operation : "";
	return APP_LAUNCH_ERROR_NONE;
}

extern "C" int app_control_operation_get(App_Request *app_control, char **operation)
{
	if (!app_control)
		return APP_LAUNCH_ERROR_INVALID_PARAMETER;
	return copy_out(app_control->operation, operation);
}

extern "C" int app_control_set_app_id(App_Request *app_control, const char *app_id)
{
	if (!app_control)
		return APP_LAUNCH_ERROR_INVALID_PARAMETER;
	app_control->app_id = app_id ? app_id : "";
	return APP_LAUNCH_ERROR_NONE;
}

extern "C" int app_control_app_id_get(App_Request *app_control, char **app_id)
{
	if (!app_control)
		return APP_LAUNCH_ERROR_INVALID_PARAMETER;
	return copy_out(app_control->app_id, app_id);
}

extern "C" int app_control_set_window(App_Request *app_control, unsigned int id)
{
	if (!app_control)
		return APP_LAUNCH_ERROR_INVALID_PARAMETER;
	app_control->window = id;
	return APP_LAUNCH_ERROR_NONE;
}

extern "C" int app_control_extra_add(App_Request *app_control, const char *key, const char *value)
{
	if (!app_control || !key || !*key || !value)
		return APP_LAUNCH_ERROR_INVALID_PARAMETER;
	// A key given again takes the new value instead of being sent twice.
	for (auto &pair : app_control->extra_data) {
		if (pair.first == key) {
			pair.second = value;
			return APP_LAUNCH_ERROR_NONE;
		}
	}
	app_control->extra_data.emplace_back(key, value);
	return APP_LAUNCH_ERROR_NONE;
}

extern "C" int app_control_send_launch_request(App_Request *app_control,
					       App_Launch_Reply_Cb, void *)
{
	if (!app_control || app_control->operation.empty() || app_control->app_id.empty())
		return APP_LAUNCH_ERROR_INVALID_PARAMETER;
	if (!app_id_is_safe(app_control->app_id))
		return APP_LAUNCH_ERROR_INVALID_PARAMETER;

	reap_finished_launchers();

	std::string launcher = launcher_dir() + "/" + app_control->app_id;
	if (!is_executable_file(launcher))
		return APP_LAUNCH_ERROR_APP_NOT_FOUND;

	std::vector<std::string> args = {launcher, "--operation", app_control->operation,
					 "--window", std::to_string(app_control->window)};
	for (const auto &pair : app_control->extra_data) {
		args.emplace_back("--data");
		args.push_back(pair.first + "=" + pair.second);
	}
	std::vector<char *> argv;
	for (auto &arg : args)
		argv.push_back(arg.data());
	argv.push_back(nullptr);

	pid_t pid;
	if (posix_spawn(&pid, launcher.c_str(), nullptr, nullptr, argv.data(), environ) != 0)
		return APP_LAUNCH_ERROR_LAUNCH_FAILED;
	std::lock_guard<std::mutex> hold(launched_lock);
	launched.push_back(pid);
	return APP_LAUNCH_ERROR_NONE;
}
