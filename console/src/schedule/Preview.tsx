import { NEVER, type Schedule } from '../rules/schedule';
import { nextRuns, wallTime, type Clock } from '../rules/scheduleRuns';
import { t } from '../texts';
import { useNow } from '../ui';
import { runWords, scheduleWords } from './words';

const kRuns = 3;
const kTick = 20_000;

interface PreviewProps {
  // Null: it can't be.
  schedule: Schedule | null;
  clock: Clock;
}

// The schedule in words and its next runs, as it is being filled in.
export function Preview({ schedule, clock }: PreviewProps) {
  const now = wallTime(clock, useNow(kTick));
  const runs = schedule === null ? [] : nextRuns(schedule, now, kRuns);
  const scheduled = schedule !== null && schedule.date_type !== NEVER;
  return (
    <section className="vorn-schedule__preview" aria-label={t('schedule.preview')}>
      <p className="vorn-schedule__words" role="status">
        {schedule === null ? t('schedule.incomplete') : scheduleWords(schedule)}
      </p>
      {scheduled && runs.length === 0 && <p>{t('schedule.runs.none')}</p>}
      {runs.length > 0 && (
        <>
          <h2 className="vorn-schedule__heading">{t('schedule.runs')}</h2>
          <ol>
            {runs.map((run) => (
              <li key={runWords(run)}>{runWords(run)}</li>
            ))}
          </ol>
          <p className="vorn-list__subtle">{t('schedule.runs.clock', { now: runWords(now) })}</p>
        </>
      )}
    </section>
  );
}
