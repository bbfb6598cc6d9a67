// When a schedule runs next. Times are fields of a clock on the wall, free of time zones.

import type { CalendarDate, Schedule } from './schedule';
import {
  DAILY,
  FROM_DATE,
  MONTHLY,
  NEVER,
  ON_WEEKDAYS,
  WEEKLY,
  YEARLY,
  daysInMonth,
  impossible,
  parseDate,
  parseWeekName,
  runHours,
} from './schedule';

export interface WallTime extends CalendarDate {
  hour: number;
  minute: number;
}

// Three runs a year apart need three years and a bit of the fourth.
const FURTHEST_DAYS = 4 * 366;

// 0 is Sunday.
export function weekdayOf(date: CalendarDate): number {
  return new Date(Date.UTC(date.year, date.month - 1, date.day)).getUTCDay();
}

function dayNumber(date: CalendarDate): number {
  return (date.year * 16 + date.month) * 32 + date.day;
}

function dayAfter(date: CalendarDate): CalendarDate {
  if (date.day < daysInMonth(date.year, date.month)) {
    return { ...date, day: date.day + 1 };
  }
  return date.month < 12
    ? { year: date.year, month: date.month + 1, day: 1 }
    : { year: date.year + 1, month: 1, day: 1 };
}

function monthlyOn(first: CalendarDate, date: CalendarDate): boolean {
  // A month that lacks the day has its run on its last one.
  return date.day === Math.min(first.day, daysInMonth(date.year, date.month));
}

function runsFrom(first: CalendarDate, repeat: number, date: CalendarDate): boolean {
  if (dayNumber(date) < dayNumber(first)) {
    return false;
  }
  switch (repeat) {
    case DAILY:
      return true;
    case WEEKLY:
      return weekdayOf(date) === weekdayOf(first);
    case MONTHLY:
      return monthlyOn(first, date);
    case YEARLY:
      return date.month === first.month && monthlyOn(first, date);
    default:
      return dayNumber(date) === dayNumber(first);
  }
}

// The next runs after `now`, at most `count`; none when the schedule is off, impossible or over.
export function nextRuns(schedule: Schedule, now: WallTime, count: number): WallTime[] {
  if (schedule.date_type === NEVER || impossible(schedule)) {
    return [];
  }
  const first = schedule.date_type === FROM_DATE ? parseDate(schedule.date) : null;
  const weekdays = schedule.date_type === ON_WEEKDAYS ? (parseWeekName(schedule.week_name) ?? []) : [];
  const runsOn = (date: CalendarDate) =>
    first ? runsFrom(first, schedule.repeat, date) : weekdays.includes(weekdayOf(date));
  const today = { year: now.year, month: now.month, day: now.day };
  let date = first && dayNumber(first) > dayNumber(today) ? first : today;
  const hours = runHours(schedule);
  const runs: WallTime[] = [];
  for (let passed = 0; passed <= FURTHEST_DAYS && runs.length < count; ++passed, date = dayAfter(date)) {
    if (!runsOn(date)) {
      continue;
    }
    for (const hour of hours) {
      const later =
        dayNumber(date) > dayNumber(today) ||
        hour > now.hour ||
        (hour === now.hour && schedule.min > now.minute);
      if (later && runs.length < count) {
        runs.push({ ...date, hour, minute: schedule.min });
      }
    }
  }
  return runs;
}

// The appliance's clock: by how much it is ahead of this computer's, in milliseconds, and its time zone of UTC's, in
// seconds.
export interface Clock {
  ahead: number;
  zone: number;
}

// Of what the appliance has told at `now`, in milliseconds since 1970 by this computer.
export function clockOf(told: { time: number; utc_offset: number }, now: number): Clock {
  return { ahead: told.time * 1000 - now, zone: told.utc_offset };
}

// What a clock beside the appliance shows at `now`, in milliseconds since 1970 by this computer.
export function wallTime(clock: Clock, now: number): WallTime {
  const date = new Date(now + clock.ahead + clock.zone * 1000);
  return {
    year: date.getUTCFullYear(),
    month: date.getUTCMonth() + 1,
    day: date.getUTCDate(),
    hour: date.getUTCHours(),
    minute: date.getUTCMinutes(),
  };
}
