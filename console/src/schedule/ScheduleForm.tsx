import {
  ActionGroup,
  Form,
  FormGroup,
  FormHelperText,
} from '@patternfly/react-core/dist/esm/components/Form';
import { HelperText, HelperTextItem } from '@patternfly/react-core/dist/esm/components/HelperText';
import { Radio } from '@patternfly/react-core/dist/esm/components/Radio';
import { useEffect, useState, type FormEvent } from 'react';
import { call } from '../api/client';
import { ApiError, codes } from '../api/error';
import { useRestored, useUnsaved } from '../api/unsaved';
import { Changed, Conflict, Outcome, SaveBar } from '../options/FormParts';
import { LeaveGuard } from '../options/LeaveGuard';
import { FROM_DATE, NEVER, ON_WEEKDAYS, type Schedule } from '../rules/schedule';
import { wallTime, type Clock } from '../rules/scheduleRuns';
import { t } from '../texts';
import { ErrorAlert, useCall } from '../ui';
import {
  draftOf,
  fieldDate,
  parametersOf,
  problemOf,
  sameSchedule,
  scheduleOf,
  type Draft,
  type Kind,
} from './draft';
import { DateFields, TimeFields, WeekdayFields } from './fields';
import { Preview } from './Preview';
import { readStored, type Stored } from './stored';
import { scheduleWords } from './words';
import './schedule.css';

function today(clock: Clock): string {
  const { year, month, day } = wallTime(clock, Date.now());
  return fieldDate(`${year}/${month}/${day}`);
}

const kKinds: readonly [Kind, 'schedule.kind.never' | 'schedule.kind.weekdays' | 'schedule.kind.date'][] = [
  [NEVER, 'schedule.kind.never'],
  [ON_WEEKDAYS, 'schedule.kind.weekdays'],
  [FROM_DATE, 'schedule.kind.date'],
];

interface ScheduleFormProps {
  stored: Schedule;
  clock: Clock;
  onStored: (stored: Stored) => void;
}

export function ScheduleForm({ stored, clock, onStored }: ScheduleFormProps) {
  const kept = useRestored<{ base: Schedule; draft: Draft }>('schedule');
  const [base, setBase] = useState(kept?.base ?? stored);
  const [draft, setDraft] = useState<Draft>(() => kept?.draft ?? draftOf(stored, today(clock)));
  const [restored, setRestored] = useState(kept !== undefined);
  const [saved, setSaved] = useState(false);
  const problem = problemOf(draft);
  const schedule = scheduleOf(draft);
  const changed = problem !== null || !sameSchedule(schedule, base);
  // Stored elsewhere since, and not what is entered here either.
  const conflict =
    changed && !sameSchedule(stored, base) && (problem !== null || !sameSchedule(stored, schedule));
  useUnsaved('schedule', changed ? { base, draft } : null);

  const take = (from: Schedule) => {
    setBase(from);
    setDraft(draftOf(from, today(clock)));
  };
  // Nothing of one's own stands in the way of what was stored elsewhere.
  useEffect(() => {
    if (sameSchedule(stored, base)) return;
    if (!changed) take(stored);
    else if (problem === null && sameSchedule(stored, schedule)) setBase(stored);
    // eslint-disable-next-line react-hooks/exhaustive-deps -- when another schedule is stored, and not at each key
  }, [stored]);

  const save = useCall(async () => {
    const now = await readStored();
    onStored(now);
    if (!now.member || (!sameSchedule(now.schedule, base) && !sameSchedule(now.schedule, schedule))) return;
    try {
      await call('schedule.set', parametersOf(draft));
    } catch (error) {
      // Another has left the domain meanwhile: the view says so.
      if (error instanceof ApiError && error.code === codes.notAMember) onStored(await readStored());
      throw error;
    }
    const after = await readStored();
    take(after.schedule);
    onStored(after);
    setSaved(true);
  });

  const edit = (change: Partial<Draft>) => {
    setSaved(false);
    setRestored(false);
    save.reset();
    setDraft((before) => ({ ...before, ...change }));
  };
  const submit = (event: FormEvent) => {
    event.preventDefault();
    setSaved(false);
    setRestored(false);
    if (changed && problem === null && !conflict && !save.busy) void save.run();
  };

  return (
    <>
      <LeaveGuard dirty={changed} />
      <Outcome saved={saved} restored={restored} />
      {conflict && (
        <Conflict
          title={t('form.conflict')}
          body={t('schedule.conflict', { theirs: scheduleWords(stored) })}
          onMine={() => setBase(stored)}
          onTheirs={() => {
            setRestored(false);
            take(stored);
          }}
        />
      )}
      {save.error !== undefined && <ErrorAlert error={save.error} title={t('form.failed')} />}
      <Form className="vorn-form" onSubmit={submit} aria-label={t('schedule.title')} noValidate>
        <FormGroup role="radiogroup" isStack label={t('schedule.kind')} fieldId="schedule-kind">
          {kKinds.map(([kind, key]) => (
            <Radio
              key={kind}
              id={`schedule-kind-${kind}`}
              name="schedule-kind"
              label={t(key)}
              isChecked={draft.kind === kind}
              isDisabled={save.busy}
              onChange={() => edit({ kind })}
            />
          ))}
        </FormGroup>
        {draft.kind === ON_WEEKDAYS && (
          <WeekdayFields draft={draft} problem={problem} disabled={save.busy} onChange={edit} />
        )}
        {draft.kind === FROM_DATE && (
          <DateFields draft={draft} problem={problem} disabled={save.busy} onChange={edit} />
        )}
        {draft.kind !== NEVER && (
          <TimeFields draft={draft} problem={problem} disabled={save.busy} onChange={edit} />
        )}
        <Preview schedule={problem === null ? schedule : null} clock={clock} />
        {changed && <Changed stored={scheduleWords(base)} />}
        {draft.kind === NEVER && base.date_type !== NEVER && (
          <FormHelperText>
            <HelperText>
              <HelperTextItem variant="warning">{t('schedule.removes')}</HelperTextItem>
            </HelperText>
          </FormHelperText>
        )}
        <ActionGroup>
          <SaveBar
            changes={changed ? 1 : 0}
            busy={save.busy}
            problem={problem !== null ? t('form.invalid') : conflict ? t('form.conflict.first') : undefined}
            onDiscard={() => {
              setSaved(false);
              setRestored(false);
              save.reset();
              take(stored);
            }}
          />
        </ActionGroup>
      </Form>
    </>
  );
}
