#include "daemon/app.h"

#include "ipc/pobject.h"
#include "platform/utility.h"
#include "processor/processor.h"
#include "utils/log.h"

Ferrixd::Ferrixd() {
    m_actions = {
        {"stop",               &Ferrixd::DoUnlink        },
        {"link",               &Ferrixd::DoLink          },
        {"add_task",           &Ferrixd::AddTask         },
        {"set_filter_setting", &Ferrixd::SetFilterSetting},
        {"get_filter_setting", &Ferrixd::GetFilterSetting},
        {"remove_task",        &Ferrixd::RemoveTask      },
        {"list_task",          &Ferrixd::ListTask        },
        {"list_entry",         &Ferrixd::ListEntry       },
    };
    m_hooks = {
        {"post_mount",  &Ferrixd::HandleVolumeMount  },
        {"pre_unmount", &Ferrixd::HandleVolumeUnmount},
    };
    InitDeviceSupport();
}

// Threads that still run are left alone with all they use: a condition variable with a waiter must
// not be destroyed, and neither must a worker at work. The process ends right after this.
Ferrixd::~Ferrixd() {
    if (m_processor_count != 0) static_cast<void>(m_processors.release());
    if (m_has_app_thread) return;
    pthread_cond_destroy(&m_queue_cond);
    pthread_mutex_destroy(&m_queue_mutex);
}

void Ferrixd::SetResponseError(int code, const std::string& text, PObject& response) {
    response.Clear();
    response["error_code"] = code;
    response["error"] = text;
}
