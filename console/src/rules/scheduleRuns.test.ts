import { describe, expect, it } from 'vitest';
import type { Schedule } from './schedule';
import { NEVER, parseDate, parseWeekName, runHours, toSchedule } from './schedule';
import type { WallTime } from './scheduleRuns';
import { clockOf, nextRuns, wallTime, weekdayOf } from './scheduleRuns';

const weekly = (week_name: string, more: Partial<Schedule> = {}) =>
  toSchedule({ date_type: 0, week_name, hour: 3, min: 30, ...more });
const dated = (date: string, repeat: number, more: Partial<Schedule> = {}) =>
  toSchedule({ date_type: 1, date, repeat, hour: 3, min: 30, ...more });
const at = (text: string): WallTime => {
  const [year, month, day, hour, minute] = text.split(/[-T:]/).map(Number) as [
    number,
    number,
    number,
    number,
    number,
  ];
  return { year, month, day, hour, minute };
};
const shown = (schedule: Schedule, now: string, count = 3) =>
  nextRuns(schedule, at(now), count).map(({ year, month, day, hour, minute }) =>
    [year, month, day].join('-').concat(` ${hour}:${String(minute).padStart(2, '0')}`),
  );

// 22 November 2026 is a Sunday.
const NOW = '2026-11-22T10:00';

describe('the next runs', () => {
  it('are on the days of the week', () => {
    expect(shown(weekly('0,3'), NOW)).toEqual(['2026-11-25 3:30', '2026-11-29 3:30', '2026-12-2 3:30']);
    expect(shown(weekly('0'), '2026-11-22T03:29')[0]).toBe('2026-11-22 3:30');
    // The minute that has begun is past: cron has started it.
    expect(shown(weekly('0'), '2026-11-22T03:30')[0]).toBe('2026-11-29 3:30');
    expect(shown(weekly('3,0,3'), NOW)).toEqual(shown(weekly('0,3'), NOW));
  });

  it('come several times a day', () => {
    const often = weekly('0,1', { hour: 8, min: 0, repeat_hour: 4, last_work_hour: 17 });
    expect(runHours(often)).toEqual([8, 12, 16]);
    expect(shown(often, NOW)).toEqual(['2026-11-22 12:00', '2026-11-22 16:00', '2026-11-23 8:00']);
    expect(runHours(weekly('0', { hour: 22, repeat_hour: 1, last_work_hour: 23 }))).toEqual([22, 23]);
    expect(runHours(weekly('0', { hour: 8, repeat_hour: 23, last_work_hour: 8 }))).toEqual([8]);
    expect(runHours(weekly('0', { hour: 9, last_work_hour: 3 }))).toEqual([9]);
  });

  it('start at the date and repeat', () => {
    expect(shown(dated('2031/5/7', 0), NOW)).toEqual(['2031-5-7 3:30']);
    expect(shown(dated('2026/11/22', 0), NOW)).toEqual([]);
    expect(shown(dated('2020/1/1', 0), NOW)).toEqual([]);
    expect(shown(dated('2026/11/24', 1), NOW)).toEqual([
      '2026-11-24 3:30',
      '2026-11-25 3:30',
      '2026-11-26 3:30',
    ]);
    expect(shown(dated('2020/1/1', 1), NOW)[0]).toBe('2026-11-23 3:30');
    // 1 January 2020 was a Wednesday.
    expect(shown(dated('2020/1/1', 2), NOW)).toEqual(['2026-11-25 3:30', '2026-12-2 3:30', '2026-12-9 3:30']);
    expect(shown(dated('2026/12/31', 4), NOW)).toEqual([
      '2026-12-31 3:30',
      '2027-12-31 3:30',
      '2028-12-31 3:30',
    ]);
    expect(shown(dated('9999/12/30', 1), NOW)).toEqual([
      '9999-12-30 3:30',
      '9999-12-31 3:30',
      '10000-1-1 3:30',
    ]);
  });

  it('fall on the last day of months that lack theirs', () => {
    expect(shown(dated('2027/1/31', 3), NOW, 4)).toEqual([
      '2027-1-31 3:30',
      '2027-2-28 3:30',
      '2027-3-31 3:30',
      '2027-4-30 3:30',
    ]);
    expect(shown(dated('2027/1/30', 3), '2028-02-01T00:00', 1)).toEqual(['2028-2-29 3:30']);
    expect(shown(dated('2024/2/29', 4), NOW)).toEqual(['2027-2-28 3:30', '2028-2-29 3:30', '2029-2-28 3:30']);
  });

  it('are none without a schedule, or with an impossible one', () => {
    expect(shown(toSchedule({ date_type: NEVER }), NOW)).toEqual([]);
    expect(shown(weekly('7'), NOW)).toEqual([]);
    expect(shown(weekly('1', { hour: 24 }), NOW)).toEqual([]);
  });
});

it('reads dates and days as the appliance does', () => {
  expect(parseDate('2031/05/7')).toEqual({ year: 2031, month: 5, day: 7 });
  expect(parseDate('2031/2/29')).toBeNull();
  expect(parseWeekName('6,0,3,3')).toEqual([0, 3, 6]);
  expect(parseWeekName('')).toBeNull();
});

it('knows the day of the week', () => {
  expect(weekdayOf({ year: 2026, month: 11, day: 22 })).toBe(0);
  expect(weekdayOf({ year: 1970, month: 1, day: 1 })).toBe(4);
  expect(weekdayOf({ year: 2000, month: 2, day: 29 })).toBe(2);
});

it('takes the time of the day from the clock of the appliance', () => {
  const here = Date.UTC(2026, 10, 22, 12, 0);
  const wall = (time: number, offset: number, later = 0) =>
    wallTime(clockOf({ time: time / 1000, utc_offset: offset }, here), here + later);
  expect(wall(here, 0)).toEqual({ year: 2026, month: 11, day: 22, hour: 12, minute: 0 });
  // Another zone, another day.
  expect(wall(here, 13 * 3600)).toEqual({ year: 2026, month: 11, day: 23, hour: 1, minute: 0 });
  expect(wall(here, -20700)).toEqual({ year: 2026, month: 11, day: 22, hour: 6, minute: 15 });
  // A wrong clock, and ten minutes later.
  expect(wall(Date.UTC(1970, 0, 1, 0, 55), 0, 600_000)).toEqual({
    year: 1970,
    month: 1,
    day: 1,
    hour: 1,
    minute: 5,
  });
});
