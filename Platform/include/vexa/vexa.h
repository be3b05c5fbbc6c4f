/* Everything that libvexaplatform offers. */
#ifndef VEXA_VEXA_H
#define VEXA_VEXA_H

#include <vexa/abi.h>
#include <vexa/clock.h>
#include <vexa/device.h>
#include <vexa/event.h>
#include <vexa/log.h>
#include <vexa/plugin.h>
#include <vexa/queue.h>
#include <vexa/run_loop.h>
#include <vexa/status.h>
#include <vexa/trace.h>
#include <vexa/value.h>

#endif
