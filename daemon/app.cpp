#include "daemon/app.h"

#include "ipc/pobject.h"
#include "platform/utility.h"
#include "processor/processor.h"
#include "utils/log.h"

Ferrixd::Ferrixd() {
    m_actions = {
        {"stop",                     &Ferrixd::DoUnlink             },
        {"link",                     &Ferrixd::DoLink               },
        {"add_task",                 &Ferrixd::AddTask              },
        {"enable_task",              &Ferrixd::EnableDefaultTask    },
        {"run_task",                 &Ferrixd::RunTask              },
        {"cancel_task",              &Ferrixd::CancelTask           },
        {"set_task_setting",         &Ferrixd::SetTaskSetting       },
        {"set_trigger_time_setting", &Ferrixd::SetTriggerTimeSetting},
        {"set_filter_setting",       &Ferrixd::SetFilterSetting     },
        {"get_task_setting",         &Ferrixd::GetTaskSetting       },
        {"get_filter_setting",       &Ferrixd::GetFilterSetting     },
        {"remove_task",              &Ferrixd::RemoveTask           },
        {"disable_task",             &Ferrixd::DisableDefaultTask   },
        {"list_task",                &Ferrixd::ListTask             },
        {"list_entry",               &Ferrixd::ListEntry            },
        {"get_task_progress",        &Ferrixd::GetTaskProgress      },
        {"set_global_setting",       &Ferrixd::SetGlobalSetting     },
    };
    m_hooks = {
        {"post_mount",            &Ferrixd::HandleVolumeMount     },
        {"pre_unmount",           &Ferrixd::HandleVolumeUnmount   },
        {"post_ferrix",           &Ferrixd::HandleFerrix          },
        {"pre_path_change",       &Ferrixd::HandleShareRemoveEntry},
        {"post_path_change",      &Ferrixd::HandleSharePathChange },
        {"pre_delete",            &Ferrixd::HandleShareDelete     },
        {"pre_encrypt",           &Ferrixd::HandleShareUnmounted  },
        {"post_decrypt",          &Ferrixd::HandleShareMounted    },
        {"pre_snapshot_restore",  &Ferrixd::HandleShareRemoveEntry},
        {"post_snapshot_restore", &Ferrixd::HandleShareReloadEntry},
        {"pre_transform",         &Ferrixd::HandleShareRemoveEntry},
        {"post_transform",        &Ferrixd::HandleShareReloadEntry},
    };
    InitDeviceSupport();
}

Ferrixd::~Ferrixd() {
    pthread_cond_destroy(&m_queue_cond);
    pthread_mutex_destroy(&m_queue_mutex);
}
