// What a schedule may be: the checks of the domain module and of the appliance's scheduler, in their order.

export const ON_WEEKDAYS = 0;
export const FROM_DATE = 1;
export const NEVER = 2;

export const ONCE = 0;
export const DAILY = 1;
export const WEEKLY = 2;
export const MONTHLY = 3;
export const YEARLY = 4;

// All eight values, as "get" answers them for a stored schedule.
export interface Schedule {
  date_type: number;
  date: string;
  hour: number;
  last_work_hour: number;
  min: number;
  repeat: number;
  repeat_hour: number;
  week_name: string;
}

export type ScheduleField = keyof Schedule;

// Why a set of parameters is refused: with which code, and which parameter is to blame.
export interface ScheduleRefusal {
  code: 2617 | 2618;
  field: ScheduleField;
}

export interface CalendarDate {
  year: number;
  month: number;
  day: number;
}

const FIRST_YEAR = 1970;
const LONGEST_TEXT = 255;

// True for what a JSON reader on the appliance takes for a 32-bit number.
export function isInt32(value: unknown): value is number {
  return typeof value === 'number' && Number.isInteger(value) && value >= -2147483648 && value <= 2147483647;
}

export function daysInMonth(year: number, month: number): number {
  const leap = (year % 4 === 0 && year % 100 !== 0) || year % 400 === 0;
  return month === 2 ? (leap ? 29 : 28) : [4, 6, 9, 11].includes(month) ? 30 : 31;
}

// A day "YYYY/M/D" that exists, from 1970 on; null for anything else.
export function parseDate(text: string): CalendarDate | null {
  const match = /^(\d{4})\/(\d{1,2})\/(\d{1,2})$/.exec(text);
  if (!match) {
    return null;
  }
  const [year, month, day] = match.slice(1).map(Number) as [number, number, number];
  const exists =
    year >= FIRST_YEAR && month >= 1 && month <= 12 && day >= 1 && day <= daysInMonth(year, month);
  return exists ? { year, month, day } : null;
}

// The days of a week name, 0 is Sunday, ascending and each once; null when it is none.
export function parseWeekName(text: string): number[] | null {
  const parts = text.split(',');
  if (!parts.every((part) => /^[0-6]$/.test(part))) {
    return null;
  }
  return [...new Set(parts.map(Number))].sort((first, second) => first - second);
}

// The hours at which a possible schedule runs on a day, ascending, at least one.
export function runHours(schedule: Schedule): number[] {
  const hours = [schedule.hour];
  if (schedule.repeat_hour > 0) {
    for (let hour = schedule.hour + schedule.repeat_hour; hour <= schedule.last_work_hour;) {
      hours.push(hour);
      hour += schedule.repeat_hour;
    }
  }
  return hours;
}

function badType(parameters: Record<string, unknown>): ScheduleField | null {
  const int = (field: ScheduleField) => (isInt32(parameters[field]) ? null : field);
  const text = (field: ScheduleField) => (typeof parameters[field] === 'string' ? null : field);
  const optionalInt = (field: ScheduleField) => (field in parameters ? int(field) : null);
  const kind = parameters['date_type'];
  if (!isInt32(kind)) {
    return 'date_type';
  }
  const needed = kind === NEVER ? null : (int('hour') ?? int('min'));
  if (needed) {
    return needed;
  }
  const days =
    kind === ON_WEEKDAYS
      ? text('week_name')
      : kind === FROM_DATE
        ? (text('date') ?? int('repeat'))
        : kind === NEVER
          ? null
          : 'date_type';
  return days ?? optionalInt('repeat_hour') ?? optionalInt('last_work_hour');
}

function storable(text: string): boolean {
  // eslint-disable-next-line no-control-regex
  return new TextEncoder().encode(text).length <= LONGEST_TEXT && !/[\u0000-\u001f\u007f]/.test(text);
}

// What is impossible about a schedule that is not "never"; null when it can be kept.
export function impossible(schedule: Schedule): ScheduleField | null {
  const outside = (field: 'hour' | 'min' | 'repeat_hour' | 'last_work_hour', most: number) =>
    schedule[field] < 0 || schedule[field] > most ? field : null;
  const time =
    outside('hour', 23) ?? outside('min', 59) ?? outside('repeat_hour', 23) ?? outside('last_work_hour', 23);
  if (time) {
    return time;
  }
  if (schedule.repeat_hour > 0 && schedule.last_work_hour < schedule.hour) {
    return 'last_work_hour';
  }
  for (const field of ['date', 'week_name'] as const) {
    if (!storable(schedule[field])) {
      return field;
    }
  }
  if (schedule.date_type === ON_WEEKDAYS) {
    return parseWeekName(schedule.week_name) ? null : 'week_name';
  }
  if (!parseDate(schedule.date)) {
    return 'date';
  }
  return schedule.repeat < ONCE || schedule.repeat > YEARLY ? 'repeat' : null;
}

// The parameters of "set" as a whole schedule; what is absent, or no value of its kind, counts as 0 or empty.
export function toSchedule(parameters: Record<string, unknown>): Schedule {
  const int = (field: ScheduleField) => (isInt32(parameters[field]) ? (parameters[field] as number) : 0);
  const text = (field: ScheduleField) =>
    typeof parameters[field] === 'string' ? (parameters[field] as string) : '';
  return {
    date_type: isInt32(parameters['date_type']) ? parameters['date_type'] : NEVER,
    date: text('date'),
    hour: int('hour'),
    last_work_hour: int('last_work_hour'),
    min: int('min'),
    repeat: int('repeat'),
    repeat_hour: int('repeat_hour'),
    week_name: text('week_name'),
  };
}

// Would "set" of the schedule, sent by a member of a domain, be refused? Null: it is accepted.
export function refusedSchedule(parameters: Record<string, unknown>): ScheduleRefusal | null {
  const wrong = badType(parameters);
  if (wrong) {
    return { code: 2618, field: wrong };
  }
  const schedule = toSchedule(parameters);
  const field = schedule.date_type === NEVER ? null : impossible(schedule);
  return field ? { code: 2617, field } : null;
}
