// Every service that the program needs from an operating system, in one bundle of references.
//
// It is built once, by main, over the services of one platform. An operation that needs several
// services takes `Platform&`; one that needs a single service takes that service.
//
// A variant of a platform is a copy in which some services are replaced:
//
//   Platform quiet = platform;
//   quiet.log = silentLog;
#pragma once

#include "platform/application_registry.h"
#include "platform/clock.h"
#include "platform/crash_reporting.h"
#include "platform/date_formatting.h"
#include "platform/device_answers.h"
#include "platform/digest.h"
#include "platform/driver_registry.h"
#include "platform/dynamic_loading.h"
#include "platform/event_loop.h"
#include "platform/file_reader.h"
#include "platform/locale.h"
#include "platform/named_service.h"
#include "platform/notifications.h"
#include "platform/preferences.h"
#include "platform/process.h"
#include "platform/process_state.h"
#include "platform/property_list_coding.h"
#include "platform/service_reference.h"
#include "platform/stack_snapshot.h"
#include "platform/standard_streams.h"
#include "platform/statistics_store.h"
#include "platform/submission.h"
#include "platform/system_controls.h"
#include "platform/system_log.h"
#include "platform/system_version.h"

namespace tavrel {

struct Platform {
  ServiceReference<PWApplicationWorkspace> applications;
  ServiceReference<Clock> clock;
  ServiceReference<CrashReporting> crashReporting;
  ServiceReference<DateFormatting> dateFormatting;
  ServiceReference<DeviceAnswers> deviceAnswers;
  ServiceReference<Digest> digest;
  ServiceReference<DriverRegistry> drivers;
  ServiceReference<DynamicLoader> dynamicLoader;
  ServiceReference<EventLoop> eventLoop;
  ServiceReference<FileReader> files;
  ServiceReference<Locale> locale;
  ServiceReference<SystemLog> log;
  ServiceReference<NamedServices> namedServices;
  ServiceReference<Notifications> notifications;
  ServiceReference<Preferences> preferences;
  ServiceReference<Process> process;
  ServiceReference<PropertyListCoding> propertyLists;
  ServiceReference<StackSnapshots> stackSnapshots;
  ServiceReference<StandardStreams> standardStreams;
  ServiceReference<StatisticsStore> statistics;
  ServiceReference<SubmissionService> submission;
  ServiceReference<SystemControls> systemControls;
  ServiceReference<SystemVersion> systemVersion;
  ServiceReference<ProcessState> state;
};

}  // namespace tavrel
