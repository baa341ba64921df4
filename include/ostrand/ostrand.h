// Everything the library exports.
#pragma once

#include <ostrand/platform.h>
#include <ostrand/version.h>

#include <ostrand/text/ustring.h>

#include <ostrand/errors/Exception.h>

#include <ostrand/system/Object.h>
#include <ostrand/system/File.h>
#include <ostrand/system/Socket.h>
#include <ostrand/system/CommPort.h>
#include <ostrand/system/Thread.h>
#include <ostrand/system/APC.h>
#include <ostrand/system/Misc.h>

#include <ostrand/logging/LogFile.h>
#include <ostrand/logging/LogFileServer.h>
