// Every service that the system needs of an operating system, in one bundle of references.
//
// It is built once, by main, over the services of one platform. An operation that needs several
// services takes `Platform&`; one that needs a single service takes that service.
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
#include "platform/files.h"
#include "platform/locale.h"
#include "platform/named_service.h"
#include "platform/notifications.h"
#include "platform/preferences.h"
#include "platform/process.h"
#include "platform/process_state.h"
#include "platform/property_list_coding.h"
#include "platform/stack_snapshot.h"
#include "platform/standard_streams.h"
#include "platform/statistics_store.h"
#include "platform/submission.h"
#include "platform/system_controls.h"
#include "platform/system_log.h"
#include "platform/system_version.h"

namespace tavrel {

struct Platform {
  PWApplicationWorkspace& applications;
  Clock& clock;
  CrashReporting& crashReporting;
  DateFormatting& dateFormatting;
  DeviceAnswers& deviceAnswers;
  Digest& digest;
  DriverRegistry& drivers;
  DynamicLoader& dynamicLoader;
  EventLoop& eventLoop;
  Files& files;
  Locale& locale;
  SystemLog& log;
  NamedServices& namedServices;
  Notifications& notifications;
  Preferences& preferences;
  Process& process;
  PropertyListCoding& propertyLists;
  StackSnapshots& stackSnapshots;
  StandardStreams& standardStreams;
  StatisticsStore& statistics;
  SubmissionService& submission;
  SystemControls& systemControls;
  SystemVersion& systemVersion;
  ProcessState& state;
};

}  // namespace tavrel
