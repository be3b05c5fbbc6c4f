/* What SamplePlugin.c and its tests agree on. */
#ifndef SAMPLE_PLUGIN_H
#define SAMPLE_PLUGIN_H

#include <vexa/plugin.h>

/* Where the sample plug-in fails. */
enum sample_failure {
    SAMPLE_FAILS_NOWHERE,
    SAMPLE_FACTORY_MAKES_NOTHING,
    SAMPLE_TABLE_IS_MISSING,
    SAMPLE_VERSION_IS_2,
    SAMPLE_SLOT_IS_EMPTY,         /* Start of the plug-in interface */
    SAMPLE_SERVICE_SLOT_IS_EMPTY, /* copyProperty of the service interface */
    SAMPLE_HAS_NO_SERVICE_INTERFACE,
    SAMPLE_PROBE_FAILS,
    SAMPLE_START_FAILS,
    SAMPLE_OPEN_FAILS,
    SAMPLE_STOP_FAILS
};

#define SAMPLE_JOURNAL_SIZE 4096

/* The one plug-in of the process. */
typedef struct sample_plugin {
    enum sample_failure failure;
    /* The calls so far, a line each. */
    char journal[SAMPLE_JOURNAL_SIZE];
    /* Adds a line. */
    void (*note)(const char* line);
    /* Services that have not been released. */
    uint32_t live;
} sample_plugin;

#define SAMPLE_PLUGIN_ACCESS_NAME "sample_plugin_access"
typedef sample_plugin* (*sample_plugin_access_function)(void);

#endif
