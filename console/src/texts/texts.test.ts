import { describe, expect, it } from 'vitest';
import { formatAge, formatDuration, formatTime, t } from '.';
import { en } from './en';
import { fill } from './message';

describe('texts', () => {
  it('take their parameters, numbers in the form of the language', () => {
    expect(t('overview.member', { domain: 'LAB' })).toBe('Member of LAB');
    expect(t('overview.lists.users', { count: 1 })).toBe('1 user');
    expect(t('overview.lists.users', { count: 100_000 })).toBe('100,000 users');
    expect(
      fill({ one: '{count} plik', few: '{count} pliki', other: '{count} plików' }, 'pl', { count: 3 }),
    ).toBe('3 pliki');
  });

  it('keep what looks like a parameter in a value', () => {
    expect(t('overview.member', { domain: '{domain}' })).toBe('Member of {domain}');
    expect(t('overview.member', { domain: '$&' })).toBe('Member of $&');
  });

  it('are none of them empty', () => {
    for (const message of Object.values(en)) {
      for (const text of typeof message === 'string' ? [message] : Object.values(message)) {
        expect(text.trim()).not.toBe('');
      }
    }
  });
});

describe('times', () => {
  const now = Date.UTC(2026, 10, 22, 12) as number;
  it.each([
    [0, 'now'],
    [59, 'now'],
    [60, '1 minute ago'],
    [3 * 3600, '3 hours ago'],
    [86_400, 'yesterday'],
    [-500, 'now'],
  ])('%d seconds before are "%s"', (seconds, words) => {
    expect(formatAge(now / 1000 - seconds, now)).toBe(words);
  });
  it('and durations have units', () => {
    expect(formatDuration(820)).toBe('820 ms');
    expect(formatDuration(4210)).toBe('4.2 sec');
    expect(formatDuration(125_000)).toBe('2 min 5 sec');
    expect(formatTime(now / 1000)).toContain('2026');
  });
});
