/* The defects that the sample plug-in can be built with: DEFECT(name, the check that must find it,
 * other checks that it fails as well; with a ? those that it fails now and then, when threads
 * meet; * any). CMake builds one plug-in for each line. */
#ifndef VEXA_TESTS_PLUGINS_DEFECTS_H
#define VEXA_TESTS_PLUGINS_DEFECTS_H

/* clang-format off */
#define VEXA_DEFECTS(DEFECT)                                                                      \
    DEFECT(AnswersNothing, "load", "")                                                            \
    DEFECT(AnswersAnyType, "factory", "")                                                         \
    DEFECT(AnswersNearlyRightType, "factory", "")                                                 \
    DEFECT(RefusesAllocator, "factory", "")                                                       \
    DEFECT(SharesOneService, "factory", "")                                                       \
    DEFECT(AnswersBaseInterface, "query-interface", "")                                           \
    DEFECT(AnswersNearlyRightInterface, "query-interface", "")                                    \
    DEFECT(AnswersOwnReference, "query-interface", "")                                            \
    DEFECT(ClearsOutPointer, "query-interface", "")                                               \
    DEFECT(WrongInterfaceStatus, "query-interface", "")                                           \
    DEFECT(MissingSlot, "slots", "event-queries before-start")                                    \
    DEFECT(NoOwner, "slots", "")                                                                  \
    DEFECT(RewritesItsTable, "slots", "")                                                         \
    DEFECT(WrongVersion, "slots", "")                                                             \
    DEFECT(CountsAreNonsense, "reference-counts", "")                                             \
    DEFECT(DestroyedEarly, "reference-counts", "reference-threads")                               \
    DEFECT(FactoryKeepsReference, "reference-counts", "reference-threads destroy memory")         \
    DEFECT(UnknownInterfaceAddsReference, "reference-counts", "")                                 \
    DEFECT(CountsWithoutAtomics, "reference-threads", "?property-threads")                        \
    DEFECT(ProbeReleasesProperties, "argument-order", "")                                         \
    DEFECT(StartsNeighbour, "argument-order", "destroy-scheduled")                                \
    DEFECT(ProbeTakesServiceFirst, "argument-order",                                              \
           "slots device-failures unplug destroy cycles leaks memory unload")                     \
    DEFECT(StartTakesServiceFirst, "argument-order", "*")                                         \
    DEFECT(StartsWithoutDevice, "unknown-service", "")                                            \
    DEFECT(FloatsBecomeDoubles, "property-values", "")                                            \
    DEFECT(IntegersLoseTheirSign, "property-values", "")                                          \
    DEFECT(StringsEndAtZero, "property-values", "")                                               \
    DEFECT(LeaksProperty, "property-values", "leaks memory unload")                               \
    DEFECT(PropertiesNeedOneThread, "property-threads", "")                                       \
    DEFECT(AnswersUnknownKeys, "unknown-keys", "")                                                \
    DEFECT(CrashesOnNullKey, "null-keys", "")                                                     \
    DEFECT(TakesAnyKey, "null-keys", "")                                                          \
    DEFECT(AbortsOnEventQuery, "event-queries", "")                                               \
    DEFECT(KeepsOutputEvent, "event-queries", "")                                                 \
    DEFECT(CrashesBeforeStart, "before-start", "unknown-service repeated-calls")                  \
    DEFECT(AbortsOnSecondOpen, "repeated-calls", "")                                              \
    DEFECT(HangsStoppedTwice, "repeated-calls", "")                                               \
    DEFECT(AbortsOnSecondSchedule, "second-schedule", "")                                         \
    DEFECT(CrashesOnLongReport, "report-lengths", "")                                             \
    DEFECT(StopsReadingAfterLongReport, "report-lengths", "")                                     \
    DEFECT(AbortsOnOddReport, "random-reports", "")                                               \
    DEFECT(DeliversOnInputThread, "events", "random-reports")                                     \
    DEFECT(DeliversOptions, "events", "random-reports")                                           \
    DEFECT(LeaksEvent, "events",                                                                  \
           "device-failures unplug destroy cycles leaks memory unload")                           \
    DEFECT(WrongRefcon, "events", "random-reports late-callback")                                 \
    DEFECT(WrongSender, "events", "random-reports")                                               \
    DEFECT(TakesLateCallback, "late-callback", "")                                                \
    DEFECT(UnschedulesLate, "unschedule", "?unload ?late-callback ?memory")                              \
    DEFECT(IgnoresOpenFailure, "device-failures", "unplug")                                       \
    DEFECT(LosesDescriptorOnFailedOpen, "device-failures", "")                                    \
    DEFECT(IgnoresRefusedProperty, "device-failures", "")                                         \
    DEFECT(AbortsWhenUnplugged, "unplug", "")                                                     \
    DEFECT(LosesDescriptorWhenUnplugged, "unplug", "")                                            \
    DEFECT(AbortsDestroyedAfterStart, "destroy", "reference-counts reference-threads")            \
    DEFECT(KeepsDeviceWhenDestroyed, "destroy", "reference-counts reference-threads")             \
    DEFECT(AbortsDestroyedWhileScheduled, "destroy-scheduled", "")                                \
    DEFECT(ExitsAfterManyStarts, "cycles", "")                                                    \
    DEFECT(GivesUpAfterManyStarts, "cycles", "")                                                  \
    DEFECT(LeaksDescriptor, "leaks",                                                              \
           "property-values device-failures unplug destroy cycles unload")                        \
    DEFECT(LeaksDevice, "leaks",                                                                  \
           "reference-counts reference-threads property-values repeated-calls device-failures "   \
           "unplug destroy cycles memory unload")                                                 \
    DEFECT(LeaksValue, "leaks",                                                                   \
           "property-values device-failures unplug destroy cycles memory unload")                 \
    DEFECT(LeavesThreadBehind, "leaks", "unplug memory unload")                                   \
    DEFECT(LeaksMemory, "memory", "")                                                             \
    DEFECT(LingersAfterUnloading, "unload", "?memory")
/* clang-format on */

#endif
