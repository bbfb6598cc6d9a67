// A schedule in words, the same as the command line says.

import type { Schedule } from '../rules/schedule';
import {
  DAILY,
  FROM_DATE,
  MONTHLY,
  ONCE,
  ON_WEEKDAYS,
  WEEKLY,
  YEARLY,
  parseDate,
  parseWeekName,
  runHours,
} from '../rules/schedule';
import type { WallTime } from '../rules/scheduleRuns';
import { currentLanguage, t } from '../texts';

const kWeekdays = [
  'schedule.day.0',
  'schedule.day.1',
  'schedule.day.2',
  'schedule.day.3',
  'schedule.day.4',
  'schedule.day.5',
  'schedule.day.6',
] as const;

// 0 is Sunday.
export function dayName(day: number): string {
  const key = kWeekdays[day];
  return key === undefined ? String(day) : t(key);
}

export function clockText(hour: number, minute: number): string {
  return `${String(hour).padStart(2, '0')}:${String(minute).padStart(2, '0')}`;
}

function timesOfDay(schedule: Schedule): string {
  const time = clockText(schedule.hour, schedule.min);
  const hours = runHours(schedule);
  if (hours.length === 1) return t('schedule.words.at', { time });
  const last = clockText(hours[hours.length - 1] ?? schedule.hour, schedule.min);
  return t('schedule.words.atAndEvery', { time, count: schedule.repeat_hour, last });
}

// "a, b and c", as the command line puts it.
function listWords(items: string[]): string {
  const last = items[items.length - 1] ?? '';
  return items.length < 2 ? last : t('schedule.words.and', { first: items.slice(0, -1).join(', '), last });
}

function weekdayWords(schedule: Schedule): string {
  const days = parseWeekName(schedule.week_name) ?? [];
  return days.length === 7
    ? t('schedule.words.everyDay')
    : t('schedule.words.everyWeekday', { days: listWords(days.map(dayName)) });
}

function dateWords(schedule: Schedule): string {
  const { date } = schedule;
  const [, month = '', day = ''] = date.split('/');
  switch (schedule.repeat) {
    case ONCE:
      return t('schedule.words.once', { date });
    case DAILY:
      return t('schedule.words.daily', { date });
    case WEEKLY:
      return t('schedule.words.weekly', { date });
    case MONTHLY:
      return (parseDate(date)?.day ?? 0) > 28
        ? t('schedule.words.monthlyOrLast', { date, day })
        : t('schedule.words.monthly', { date, day });
    case YEARLY:
      return t('schedule.words.yearly', { date, day: `${month}/${day}` });
    default:
      return t('schedule.words.from', { date });
  }
}

// One sentence; the schedule is one that is possible.
export function scheduleWords(schedule: Schedule): string {
  switch (schedule.date_type) {
    case ON_WEEKDAYS:
      return t('schedule.words.onWeekdays', {
        days: weekdayWords(schedule),
        times: timesOfDay(schedule),
      });
    case FROM_DATE:
      return t('schedule.words.fromDate', { days: dateWords(schedule), times: timesOfDay(schedule) });
    default:
      return t('schedule.words.never');
  }
}

// One run, for a list: "Sunday, November 29, 2026 at 03:30".
export function runWords(run: WallTime): string {
  const day = new Intl.DateTimeFormat(currentLanguage(), { dateStyle: 'full', timeZone: 'UTC' }).format(
    Date.UTC(run.year, run.month - 1, run.day),
  );
  return t('schedule.run', { day, time: clockText(run.hour, run.minute) });
}
