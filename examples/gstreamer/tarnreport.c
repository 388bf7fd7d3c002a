// SPDX-License-Identifier: Apache-2.0
/* tarnreport: an element that lets a stream of sound pass and reports it: a session for each time that it runs, with
 * the time that it played by the stream's own clock. So durations are right however fast the sink takes the buffers.
 *
 *   gst-launch-1.0 filesrc location=x.wav ! wavparse ! tarnreport ! autoaudiosink
 */
#include <gst/base/gstbasetransform.h>
#include <gst/gst.h>
#include <tarnreporting_messages.h>
#include <tarnreporting_reports.h>

#define TARN_TYPE_REPORT_ELEMENT (tarn_report_get_type())
G_DECLARE_FINAL_TYPE(TarnReport, tarn_report, TARN, REPORT, GstBaseTransform)

struct _TarnReport {
  GstBaseTransform parent;
  /* Properties. */
  gchar* application;
  gchar* route;
  gchar* socket;
  guint service_type;
  gdouble volume;
  /* While it runs. */
  tarnreporting_client* client;
  tarnreporting_session* session;
  tarnreporting_writer* writer;
  tarnreporting_reports reports;
  gboolean playing; /* told as running */
  gdouble told_volume;
  guint64 began;       /* when the first buffer came, in nanoseconds since 1970 */
  GstClockTime first;  /* its running time */
  GstClockTime played; /* the running time up to which there were buffers */
};

G_DEFINE_TYPE(TarnReport, tarn_report, GST_TYPE_BASE_TRANSFORM)

enum { PROP_NONE, PROP_APPLICATION, PROP_ROUTE, PROP_SOCKET, PROP_SERVICE_TYPE, PROP_VOLUME };

static GstStaticPadTemplate sink_template =
    GST_STATIC_PAD_TEMPLATE("sink", GST_PAD_SINK, GST_PAD_ALWAYS, GST_STATIC_CAPS_ANY);
static GstStaticPadTemplate source_template =
    GST_STATIC_PAD_TEMPLATE("src", GST_PAD_SRC, GST_PAD_ALWAYS, GST_STATIC_CAPS_ANY);

static gboolean start(GstBaseTransform* transform) {
  TarnReport* self = TARN_REPORT(transform);
  tarnreporting_client_options client_options = {0};
  tarnreporting_session_options options = {0};
  client_options.size = sizeof client_options;
  client_options.socket_path = self->socket;
  options.size = sizeof options;
  options.service_type = self->service_type;
  options.application = self->application != NULL ? self->application : g_get_prgname();
  self->playing = FALSE;
  if (tarnreporting_client_open(&client_options, &self->client) != TARNREPORTING_OK ||
      tarnreporting_session_begin(self->client, &options, &self->session) != TARNREPORTING_OK ||
      tarnreporting_reports_declare(self->session, &self->reports) != TARNREPORTING_OK ||
      tarnreporting_writer_open(self->client, NULL, &self->writer) != TARNREPORTING_OK) {
    GST_WARNING_OBJECT(self, "nothing is reported"); /* and the stream passes all the same */
  }
  return TRUE;
}

static guint64 moment_of(const TarnReport* self, GstClockTime running_time) {
  return self->began + (running_time - self->first);
}

static void end_playing(TarnReport* self) {
  if (!self->playing) return;
  self->playing = FALSE;
  (void)tarnreporting_report_output_stopped_at(self->writer, &self->reports, moment_of(self, self->played));
}

static gboolean stop(GstBaseTransform* transform) {
  TarnReport* self = TARN_REPORT(transform);
  guint64 left = 0;
  end_playing(self);
  (void)tarnreporting_client_close(self->client, 1000, &left);
  if (left != 0) {
    GST_WARNING_OBJECT(self, "%" G_GUINT64_FORMAT " messages were not taken", left);
  }
  self->client = NULL;
  self->session = NULL;
  self->writer = NULL;
  return TRUE;
}

/* In the streaming thread, which must not wait. */
static GstFlowReturn pass(GstBaseTransform* transform, GstBuffer* buffer) {
  TarnReport* self = TARN_REPORT(transform);
  const GstClockTime at = gst_segment_to_running_time(&transform->segment, GST_FORMAT_TIME, GST_BUFFER_PTS(buffer));
  if (!GST_CLOCK_TIME_IS_VALID(at)) return GST_FLOW_OK;
  GST_OBJECT_LOCK(self);
  const gdouble volume = self->volume;
  GST_OBJECT_UNLOCK(self);
  if (!self->playing) {
    self->playing = TRUE;
    self->began = (guint64)g_get_real_time() * 1000;
    self->first = at;
    self->told_volume = volume;
    (void)tarnreporting_report_output_running_at(self->writer, &self->reports, self->began, volume, self->route);
  } else if (GST_BUFFER_FLAG_IS_SET(buffer, GST_BUFFER_FLAG_DISCONT)) {
    (void)tarnreporting_report_error_at(self->writer, &self->reports, moment_of(self, at), "discontinuity");
  }
  if (self->told_volume != volume) {
    self->told_volume = volume;
    (void)tarnreporting_report_volume_changed_at(self->writer, &self->reports, moment_of(self, at), volume);
  }
  self->played = at + (GST_BUFFER_DURATION_IS_VALID(buffer) ? GST_BUFFER_DURATION(buffer) : 0);
  return GST_FLOW_OK;
}

static gboolean take_event(GstBaseTransform* transform, GstEvent* event) {
  if (GST_EVENT_TYPE(event) == GST_EVENT_EOS || GST_EVENT_TYPE(event) == GST_EVENT_FLUSH_STOP) {
    end_playing(TARN_REPORT(transform));
  }
  return GST_BASE_TRANSFORM_CLASS(tarn_report_parent_class)->sink_event(transform, event);
}

static void set_property(GObject* object, guint property, const GValue* value, GParamSpec* parameter) {
  TarnReport* self = TARN_REPORT(object);
  gchar** text = property == PROP_APPLICATION ? &self->application
                 : property == PROP_ROUTE     ? &self->route
                 : property == PROP_SOCKET    ? &self->socket
                                              : NULL;
  if (text != NULL) {
    g_free(*text);
    *text = g_value_dup_string(value);
  } else if (property == PROP_SERVICE_TYPE) {
    self->service_type = g_value_get_uint(value);
  } else if (property == PROP_VOLUME) {
    GST_OBJECT_LOCK(self);
    self->volume = g_value_get_double(value); /* the streaming thread tells it */
    GST_OBJECT_UNLOCK(self);
  } else {
    G_OBJECT_WARN_INVALID_PROPERTY_ID(object, property, parameter);
  }
}

static void get_property(GObject* object, guint property, GValue* value, GParamSpec* parameter) {
  TarnReport* self = TARN_REPORT(object);
  switch (property) {
    case PROP_APPLICATION:
      g_value_set_string(value, self->application);
      break;
    case PROP_ROUTE:
      g_value_set_string(value, self->route);
      break;
    case PROP_SOCKET:
      g_value_set_string(value, self->socket);
      break;
    case PROP_SERVICE_TYPE:
      g_value_set_uint(value, self->service_type);
      break;
    case PROP_VOLUME:
      g_value_set_double(value, self->volume);
      break;
    default:
      G_OBJECT_WARN_INVALID_PROPERTY_ID(object, property, parameter);
  }
}

static void finalize(GObject* object) {
  TarnReport* self = TARN_REPORT(object);
  g_free(self->application);
  g_free(self->route);
  g_free(self->socket);
  G_OBJECT_CLASS(tarn_report_parent_class)->finalize(object);
}

static void tarn_report_init(TarnReport* self) {
  self->route = g_strdup("default");
  self->service_type = TARN_SERVICE_LONG_FORM_AUDIO;
  self->volume = 1;
  gst_base_transform_set_passthrough(GST_BASE_TRANSFORM(self), TRUE);
}

static void tarn_report_class_init(TarnReportClass* class) {
  GObjectClass* object_class = G_OBJECT_CLASS(class);
  GstBaseTransformClass* transform_class = GST_BASE_TRANSFORM_CLASS(class);
  const GParamFlags flags = G_PARAM_READWRITE | G_PARAM_STATIC_STRINGS | GST_PARAM_MUTABLE_READY;
  const GParamFlags any_time = G_PARAM_READWRITE | G_PARAM_STATIC_STRINGS | GST_PARAM_MUTABLE_PLAYING;
  object_class->set_property = set_property;
  object_class->get_property = get_property;
  object_class->finalize = finalize;
  transform_class->start = start;
  transform_class->stop = stop;
  transform_class->sink_event = take_event;
  transform_class->transform_ip = pass;
  transform_class->transform_ip_on_passthrough = TRUE;
  g_object_class_install_property(
      object_class, PROP_APPLICATION,
      g_param_spec_string("application", "Application", "Who plays; the program's name", NULL, flags));
  g_object_class_install_property(object_class, PROP_ROUTE,
                                  g_param_spec_string("route", "Route", "The devices that play", "default", flags));
  g_object_class_install_property(
      object_class, PROP_SOCKET,
      g_param_spec_string("socket", "Socket", "The service's, where it isn't the usual one", NULL, flags));
  g_object_class_install_property(object_class, PROP_SERVICE_TYPE,
                                  g_param_spec_uint("service-type", "Service type", "What the session is for", 0, 65535,
                                                    TARN_SERVICE_LONG_FORM_AUDIO, flags));
  g_object_class_install_property(object_class, PROP_VOLUME,
                                  g_param_spec_double("volume", "Volume", "As it is reported", 0, 1, 1, any_time));
  gst_element_class_set_static_metadata(GST_ELEMENT_CLASS(class), "Reports playback", "Filter/Analyzer/Audio",
                                        "Tells the reporting service what plays", "tarnkit");
  gst_element_class_add_static_pad_template(GST_ELEMENT_CLASS(class), &sink_template);
  gst_element_class_add_static_pad_template(GST_ELEMENT_CLASS(class), &source_template);
}

static gboolean plugin_init(GstPlugin* plugin) {
  return gst_element_register(plugin, "tarnreport", GST_RANK_NONE, TARN_TYPE_REPORT_ELEMENT);
}

#define PACKAGE "tarnkit"
GST_PLUGIN_DEFINE(GST_VERSION_MAJOR, GST_VERSION_MINOR, tarnreport, "Reports playback", plugin_init, "1.0.0",
                  GST_LICENSE_UNKNOWN, "tarnkit", "tarnkit")
