/* A plug-in, which its host loads and unloads as it likes. */
#include <stddef.h>
#include <tarnreporting.h>

int plugin_run(void);

int plugin_run(void) {
  tarnreporting_client* client;
  tarnreporting_session* session;
  tarnreporting_shape* shape;
  tarnreporting_writer* writer;
  tarnreporting_shape_options options = {0};
  int result;
  options.size = sizeof options;
  options.category = 4;
  options.type = 1;
  if (tarnreporting_client_open(NULL, &client) || tarnreporting_session_begin(client, NULL, &session) ||
      tarnreporting_shape_declare(session, &options, &shape) || tarnreporting_writer_open(client, NULL, &writer)) {
    return -1;
  }
  result = tarnreporting_post(writer, shape, NULL, 0);
  (void)tarnreporting_client_close(client, 0, NULL);
  return result;
}
