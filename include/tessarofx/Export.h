// Symbol visibility for the plug-in and the host kit. Everything else is hidden.
#pragma once

#if defined(_WIN32)
#define TFX_API __declspec(dllexport)
#define TFX_HOST_API __declspec(dllexport)
#else
// Functions the plug-in (libTessaroFx.so) publishes beside its entry points.
#define TFX_API __attribute__((visibility("default")))
// Functions and constants the host kit (libTessaroFxHost.so) publishes.
#define TFX_HOST_API __attribute__((visibility("default")))
#endif
