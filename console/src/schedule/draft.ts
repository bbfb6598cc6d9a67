import type { ScheduleParameters } from '../api/types';
import {
  DAILY,
  FROM_DATE,
  NEVER,
  ON_WEEKDAYS,
  parseDate,
  parseWeekName,
  refusedSchedule,
  toSchedule,
  type Schedule,
  type ScheduleField,
} from '../rules/schedule';

export type Kind = typeof ON_WEEKDAYS | typeof FROM_DATE | typeof NEVER;

// The form as it is filled in. What the chosen kind has no use for is kept in case that it is chosen again.
export interface Draft {
  kind: Kind;
  // 0 is Sunday; ascending.
  days: number[];
  // As a date field has it, 2026-11-29; empty: none.
  date: string;
  repeat: number;
  hour: number;
  min: number;
  // Hours between two runs on a day; 0: one run.
  every: number;
  // The last hour in which a run may start.
  last: number;
}

const kLastHour = 23;

function padded(number: number): string {
  return String(number).padStart(2, '0');
}

// "2031/5/7" as "2031-05-07"; empty when it is no day.
export function fieldDate(text: string): string {
  const date = parseDate(text);
  return date === null ? '' : `${date.year}-${padded(date.month)}-${padded(date.day)}`;
}

// The form of what is stored, a new one beginning with each night at half past three. `today` as 2026-11-29.
export function draftOf(stored: Schedule, today: string): Draft {
  if (stored.date_type !== ON_WEEKDAYS && stored.date_type !== FROM_DATE) {
    return {
      kind: NEVER,
      days: [0],
      date: today,
      repeat: DAILY,
      hour: 3,
      min: 30,
      every: 0,
      last: kLastHour,
    };
  }
  const weekly = stored.date_type === ON_WEEKDAYS;
  return {
    kind: stored.date_type,
    days: parseWeekName(stored.week_name) ?? (weekly ? [] : [0]),
    date: fieldDate(stored.date) || (weekly ? today : ''),
    repeat: weekly ? DAILY : stored.repeat,
    hour: stored.hour,
    min: stored.min,
    every: stored.repeat_hour,
    last: stored.repeat_hour > 0 ? stored.last_work_hour : kLastHour,
  };
}

// What "set" is to be called with.
export function parametersOf(draft: Draft): ScheduleParameters {
  if (draft.kind === NEVER) return { date_type: NEVER };
  return {
    date_type: draft.kind,
    hour: draft.hour,
    min: draft.min,
    repeat_hour: draft.every,
    last_work_hour: draft.every > 0 ? draft.last : 0,
    ...(draft.kind === ON_WEEKDAYS
      ? { week_name: draft.days.join(',') }
      : { date: draft.date.replaceAll('-', '/'), repeat: draft.repeat }),
  };
}

export function scheduleOf(draft: Draft): Schedule {
  return toSchedule({ ...parametersOf(draft) });
}

// The part of the form for which the appliance would refuse it; null: it would be stored.
export function problemOf(draft: Draft): ScheduleField | null {
  return refusedSchedule({ ...parametersOf(draft) })?.field ?? null;
}

// What counts of a schedule, for comparing: "6,0,0" and "0,6" are the same days.
function essence(schedule: Schedule): string {
  if (schedule.date_type === NEVER) return '';
  const { date_type, hour, min, repeat_hour } = schedule;
  const days =
    date_type === ON_WEEKDAYS
      ? parseWeekName(schedule.week_name)?.join(',')
      : `${fieldDate(schedule.date)} ${schedule.repeat}`;
  return [date_type, hour, min, repeat_hour, repeat_hour > 0 ? schedule.last_work_hour : '', days].join(' ');
}

export function sameSchedule(first: Schedule, second: Schedule): boolean {
  return essence(first) === essence(second);
}
