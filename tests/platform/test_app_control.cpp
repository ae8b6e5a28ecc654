#include <app_control.h>
#include <gtest/gtest.h>

#include <chrono>
#include <cstdlib>
#include <dirent.h>
#include <fstream>
#include <sstream>
#include <string>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>

#include "ie-test-harness.h"

namespace {

class AppControl : public iet::EflTest {
protected:
	void SetUp() override
	{
		iet::EflTest::SetUp();
		launchers = iet::temp_dir();
		setenv("APP_CONTROL_LAUNCHER_DIR", launchers.c_str(), 1);
		ASSERT_EQ(app_control_create(&handle), APP_CONTROL_ERROR_NONE);
	}
	void TearDown() override
	{
		app_control_destroy(handle);
		iet::EflTest::TearDown();
	}

	// A launcher that writes its arguments, one per line, to `output`.
	void install_launcher(const std::string &app_id, const std::string &output, mode_t mode = 0755)
	{
		std::string path = launchers + "/" + app_id;
		std::ofstream(path) << "#!/bin/sh\nfor a in \"$@\"; do echo \"$a\"; done > " << output << ".tmp\n"
				    << "mv " << output << ".tmp " << output << "\n";
		chmod(path.c_str(), mode);
	}

	static std::string wait_for_file(const std::string &path)
	{
		auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(10);
		while (access(path.c_str(), F_OK) != 0 && std::chrono::steady_clock::now() < deadline)
			std::this_thread::sleep_for(std::chrono::milliseconds(10));
		std::stringstream text;
		text << std::ifstream(path).rdbuf();
		return text.str();
	}

	std::string launchers;
	app_control_h handle = nullptr;
};

int zombie_children()
{
	int count = 0;
	DIR *proc = opendir("/proc");
	while (dirent *entry = readdir(proc)) {
		std::ifstream stat(std::string("/proc/") + entry->d_name + "/stat");
		std::string line;
		if (!std::getline(stat, line))
			continue;
		// pid (comm) state ppid ...
		std::istringstream rest(line.substr(line.rfind(')') + 2));
		char state;
		int ppid;
		if (rest >> state >> ppid && state == 'Z' && ppid == getpid())
			count++;
	}
	closedir(proc);
	return count;
}

} // namespace

TEST_F(AppControl, LaunchRunsTheRegisteredLauncherWithTheRequest)
{
	std::string output = iet::temp_dir() + "/args";
	install_launcher("setting-storage-efl", output);
	app_control_set_operation(handle, APP_CONTROL_OPERATION_VIEW);
	app_control_set_window(handle, 4242);
	app_control_set_app_id(handle, "setting-storage-efl");
	app_control_add_extra_data(handle, "path", "/opt/usr/media/a b.jpg");
	app_control_add_extra_data(handle, "mode", "old");
	app_control_add_extra_data(handle, "mode", "new");

	EXPECT_EQ(app_control_send_launch_request(handle, nullptr, nullptr), APP_CONTROL_ERROR_NONE);
	EXPECT_EQ(wait_for_file(output),
		  "--operation\n" APP_CONTROL_OPERATION_VIEW "\n--window\n4242\n"
		  "--data\npath=/opt/usr/media/a b.jpg\n--data\nmode=new\n");
}

TEST_F(AppControl, RefusesUnknownUnsafeAndIncompleteRequests)
{
	std::string output = iet::temp_dir() + "/args";
	install_launcher("not-executable", output, 0644);
	app_control_set_operation(handle, APP_CONTROL_OPERATION_VIEW);

	EXPECT_EQ(app_control_send_launch_request(handle, nullptr, nullptr), APP_CONTROL_ERROR_INVALID_PARAMETER);
	app_control_set_app_id(handle, "setting-storage-efl");
	EXPECT_EQ(app_control_send_launch_request(handle, nullptr, nullptr), APP_CONTROL_ERROR_APP_NOT_FOUND);
	app_control_set_app_id(handle, "not-executable");
	EXPECT_EQ(app_control_send_launch_request(handle, nullptr, nullptr), APP_CONTROL_ERROR_APP_NOT_FOUND);

	// An app id must not reach outside the launcher directory.
	install_launcher("escaped", output);
	std::string outside = "../" + launchers.substr(launchers.rfind('/') + 1) + "/escaped";
	app_control_set_app_id(handle, outside.c_str());
	EXPECT_EQ(app_control_send_launch_request(handle, nullptr, nullptr), APP_CONTROL_ERROR_INVALID_PARAMETER);

	app_control_set_app_id(handle, "escaped");
	app_control_set_operation(handle, nullptr);
	EXPECT_EQ(app_control_send_launch_request(handle, nullptr, nullptr), APP_CONTROL_ERROR_INVALID_PARAMETER);
	EXPECT_EQ(access(output.c_str(), F_OK), -1);
}

TEST_F(AppControl, FinishedLaunchersDoNotStayZombies)
{
	std::string dir = iet::temp_dir();
	install_launcher("quick", dir + "/first");
	app_control_set_operation(handle, APP_CONTROL_OPERATION_DEFAULT);
	app_control_set_app_id(handle, "quick");
	ASSERT_EQ(app_control_send_launch_request(handle, nullptr, nullptr), APP_CONTROL_ERROR_NONE);
	wait_for_file(dir + "/first");
	auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(10);
	while (zombie_children() == 0 && std::chrono::steady_clock::now() < deadline)
		std::this_thread::sleep_for(std::chrono::milliseconds(10));
	ASSERT_EQ(zombie_children(), 1);

	// The next request collects the finished launcher.
	app_control_set_app_id(handle, "unknown");
	EXPECT_EQ(app_control_send_launch_request(handle, nullptr, nullptr), APP_CONTROL_ERROR_APP_NOT_FOUND);
	EXPECT_EQ(zombie_children(), 0);
}
