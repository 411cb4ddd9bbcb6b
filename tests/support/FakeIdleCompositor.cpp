// A least Wayland compositor: a seat, ext-idle-notify unless --no-idle-notify; commands on stdin.
#include "ext-idle-notify-v1-server-protocol.h"

#include <wayland-server.h>

#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

namespace {

std::vector<wl_resource*> notifications;
wl_display* display = nullptr;
std::string pending;

void destroyResource(wl_client*, wl_resource* resource) {
  wl_resource_destroy(resource);
}
void forgetNotification(wl_resource* resource) {
  std::erase(notifications, resource);
}

const struct ext_idle_notification_v1_interface notificationImplementation = {destroyResource};

void getIdleNotification(wl_client* client, wl_resource* notifier, uint32_t id, uint32_t timeout,
                         wl_resource*) {
  wl_resource* resource =
      wl_resource_create(client, &ext_idle_notification_v1_interface, wl_resource_get_version(notifier), id);
  wl_resource_set_implementation(resource, &notificationImplementation, nullptr, forgetNotification);
  notifications.push_back(resource);
  std::printf("notification %u\n", timeout);
  std::fflush(stdout);
}

const struct ext_idle_notifier_v1_interface notifierImplementation = {destroyResource, getIdleNotification};

void bindNotifier(wl_client* client, void*, uint32_t version, uint32_t id) {
  wl_resource* resource = wl_resource_create(client, &ext_idle_notifier_v1_interface, int(version), id);
  wl_resource_set_implementation(resource, &notifierImplementation, nullptr, nullptr);
}

void seatGet(wl_client* client, wl_resource*, uint32_t) {
  wl_client_post_no_memory(client);  // no input devices here
}

const struct wl_seat_interface seatImplementation = {seatGet, seatGet, seatGet, destroyResource};

void bindSeat(wl_client* client, void*, uint32_t version, uint32_t id) {
  wl_resource* resource = wl_resource_create(client, &wl_seat_interface, int(version), id);
  wl_resource_set_implementation(resource, &seatImplementation, nullptr, nullptr);
}

int readCommands(int fd, uint32_t, void*) {
  char buffer[256];
  const ssize_t count = read(fd, buffer, sizeof buffer);
  if (count <= 0) {
    wl_display_terminate(display);
    return 0;
  }
  pending.append(buffer, size_t(count));
  for (size_t end; (end = pending.find('\n')) != std::string::npos; pending.erase(0, end + 1)) {
    const std::string command = pending.substr(0, end);
    for (wl_resource* notification : notifications)
      if (command == "idle" || command == "resume")
        (command == "idle" ? ext_idle_notification_v1_send_idled
                           : ext_idle_notification_v1_send_resumed)(notification);
    if (command == "quit") wl_display_terminate(display);
  }
  wl_display_flush_clients(display);
  return 0;
}

}  // namespace

int main(int argc, char** argv) {
  if (argc < 2) {
    std::fprintf(stderr, "usage: fake_idle_compositor SOCKET_NAME [--no-idle-notify]\n");
    return 2;
  }
  const bool offerIdleNotify = !(argc > 2 && std::strcmp(argv[2], "--no-idle-notify") == 0);
  display = wl_display_create();
  if (wl_display_add_socket(display, argv[1]) != 0) {
    std::fprintf(stderr, "cannot listen on %s\n", argv[1]);
    return 1;
  }
  wl_global_create(display, &wl_seat_interface, 1, nullptr, bindSeat);
  if (offerIdleNotify) wl_global_create(display, &ext_idle_notifier_v1_interface, 1, nullptr, bindNotifier);
  wl_event_loop_add_fd(wl_display_get_event_loop(display), STDIN_FILENO, WL_EVENT_READABLE, readCommands,
                       nullptr);
  std::printf("ready\n");
  std::fflush(stdout);
  wl_display_run(display);
  wl_display_destroy_clients(display);
  wl_display_destroy(display);
  return 0;
}
