import { currentLanguage } from '.';

// Seconds since 1970 as a date and time of day.
export function formatTime(seconds: number): string {
  return new Intl.DateTimeFormat(currentLanguage(), {
    dateStyle: 'medium',
    timeStyle: 'short',
    hourCycle: 'h23',
  }).format(seconds * 1000);
}

export function formatExactTime(seconds: number): string {
  return new Intl.DateTimeFormat(currentLanguage(), {
    dateStyle: 'full',
    timeStyle: 'long',
    hourCycle: 'h23',
  }).format(seconds * 1000);
}

const kUnits: [Intl.RelativeTimeFormatUnit, number][] = [
  ['year', 365 * 86400],
  ['month', 30 * 86400],
  ['day', 86400],
  ['hour', 3600],
  ['minute', 60],
];

// How long ago, in the largest unit that fits: "5 minutes ago". A time to come counts as now.
export function formatAge(seconds: number, now = Date.now()): string {
  const age = Math.max(0, Math.floor(now / 1000) - seconds);
  const format = new Intl.RelativeTimeFormat(currentLanguage(), { numeric: 'auto' });
  for (const [unit, length] of kUnits) {
    if (age >= length) return format.format(-Math.floor(age / length), unit);
  }
  return format.format(0, 'second');
}

// A duration: "820 ms", "4.2 sec", "2 min 5 sec".
export function formatDuration(milliseconds: number): string {
  const unit = (name: string, value: number, digits = 0) =>
    new Intl.NumberFormat(currentLanguage(), {
      style: 'unit',
      unit: name,
      unitDisplay: 'short',
      maximumFractionDigits: digits,
    }).format(value);
  if (milliseconds < 1000) return unit('millisecond', Math.round(milliseconds));
  if (milliseconds < 10_000) return unit('second', milliseconds / 1000, 1);
  const seconds = Math.floor(milliseconds / 1000);
  if (seconds < 60) return unit('second', seconds);
  return `${unit('minute', Math.floor(seconds / 60))} ${unit('second', seconds % 60)}`;
}

export function formatNumber(value: number): string {
  return new Intl.NumberFormat(currentLanguage()).format(value);
}

export function formatList(items: readonly string[]): string {
  return new Intl.ListFormat(currentLanguage(), { type: 'conjunction' }).format(items);
}
