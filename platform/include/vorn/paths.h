// Where the product lives. Constants on purpose: nothing reads an environment variable.
#ifndef VORN_PATHS_H
#define VORN_PATHS_H

#define VORN_PATH_CONFIG "/usr/vorn/etc/vornreport.conf"
#define VORN_PATH_SHARES "/usr/vorn/etc/share.conf"
#define VORN_PATH_FLEET "/usr/vorn/etc/fleet.conf"
#define VORN_PATH_HISTORY_DB "/usr/vorn/etc/vornreport.db"
#define VORN_PATH_HISTORY_SCHEMA "/usr/vorn/vornreport/sql/vornreport.sql"
#define VORN_PATH_TEMPLATE_SCRIPT "/usr/vorn/vornreport/reportUI/build-template.sh"
#define VORN_PATH_TEMPLATE "/usr/vorn/vornreport/reportUI/template"
#define VORN_PATH_STAT "/usr/vorn/var/stat"
#define VORN_PATH_STATUS "/usr/vorn/var/status"
#define VORN_PATH_PROGRESS "/usr/vorn/var/progress"
#define VORN_PATH_REPORTS "/usr/vorn/var/reports"
#define VORN_PATH_CRON "/etc/cron.d"
#define VORN_PATH_UNITS "/etc/systemd/system"
#define VORN_PATH_SHIPPED_UNITS "/usr/lib/systemd/system"

// The name beside a run's statistics database of what it took over from a share's file index.
#define VORN_INDEX_COPY "index.db"

// The line of a timer that says its times as cron's fields; systemd leaves it aside.
#define VORN_TIMER_TIMES "X-VornTimes"

// Temporary files of a run; the argument is the process id.
#define VORN_TMP_DATA_FORMAT "/tmp/vornreport_data.%u"
#define VORN_TMP_BODY_FORMAT "/tmp/vornreport_body.%u"
#define VORN_TMP_CMD_FORMAT "/tmp/vornreport_cmd.%u"

#endif
