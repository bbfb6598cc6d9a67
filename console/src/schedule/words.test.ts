import { readFileSync } from 'node:fs';
import { resolve } from 'node:path';
import { expect, it } from 'vitest';
import { toSchedule } from '../rules/schedule';
import { runWords, scheduleWords } from './words';

interface Vector {
  schedule: Record<string, unknown>;
  words: string;
}

const path = resolve(__dirname, '../../../tests/console-rules/schedule-words.json');
const { vectors } = JSON.parse(readFileSync(path, 'utf8')) as { vectors: Vector[] };

it.each(vectors)('$schedule: $words', ({ schedule, words }) => {
  expect(scheduleWords(toSchedule(schedule))).toBe(words);
});

it('names a day once, in the order of the week', () => {
  expect(scheduleWords(toSchedule({ date_type: 0, week_name: '6,0,6', hour: 3, min: 30 }))).toBe(
    'Every Sunday and Saturday at 03:30.',
  );
});

it('names a run with its day', () => {
  expect(runWords({ year: 2026, month: 11, day: 29, hour: 3, minute: 5 })).toBe(
    'Sunday, November 29, 2026 at 03:05',
  );
});
