#pragma once

// Every public header of libzarlcore.
#include <zarl/core/Message.h>
#include <zarl/core/MessageFramer.h>
#include <zarl/core/NotificationListener.h>
#include <zarl/core/Notify.h>
#include <zarl/core/Protocol.h>
#include <zarl/core/ZARLFailedResponse.h>
#include <zarl/core/ZARLRequest.h>
#include <zarl/core/ZARLResponse.h>
