import { Button } from '@patternfly/react-core/dist/esm/components/Button';
import { Checkbox } from '@patternfly/react-core/dist/esm/components/Checkbox';
import { FormGroup, FormHelperText } from '@patternfly/react-core/dist/esm/components/Form';
import { FormSelect, FormSelectOption } from '@patternfly/react-core/dist/esm/components/FormSelect';
import { HelperText, HelperTextItem } from '@patternfly/react-core/dist/esm/components/HelperText';
import { TextInput } from '@patternfly/react-core/dist/esm/components/TextInput';
import type { ReactNode } from 'react';
import { DAILY, MONTHLY, ONCE, parseDate, WEEKLY, YEARLY, type ScheduleField } from '../rules/schedule';
import { t } from '../texts';
import type { Draft } from './draft';
import { clockText, dayName } from './words';

interface FieldsProps {
  draft: Draft;
  problem: ScheduleField | null;
  disabled: boolean;
  onChange: (change: Partial<Draft>) => void;
}

const kDays = [0, 1, 2, 3, 4, 5, 6];
const kHours = Array.from({ length: 24 }, (_unused, hour) => hour);
const kMinutes = Array.from({ length: 60 }, (_unused, minute) => minute);

function Help({ id, text, error }: { id: string; text?: string; error?: string | false }) {
  return (
    <FormHelperText>
      <HelperText id={id} aria-live="polite">
        {text !== undefined && <HelperTextItem>{text}</HelperTextItem>}
        {error && <HelperTextItem variant="error">{error}</HelperTextItem>}
      </HelperText>
    </FormHelperText>
  );
}

interface SelectProps {
  id: string;
  label: string;
  value: number;
  options: readonly (readonly [number, string])[];
  disabled: boolean;
  wrong?: boolean;
  describedBy?: string;
  onChange: (value: number) => void;
}

function NumberSelect({
  id,
  label,
  value,
  options,
  disabled,
  wrong = false,
  describedBy,
  onChange,
}: SelectProps) {
  return (
    <FormSelect
      id={id}
      aria-label={label}
      value={String(value)}
      isDisabled={disabled}
      validated={wrong ? 'error' : 'default'}
      aria-invalid={wrong}
      {...(describedBy === undefined ? {} : { 'aria-describedby': describedBy })}
      onChange={(_event, text) => onChange(Number(text))}
    >
      {options.map(([option, words]) => (
        <FormSelectOption key={option} value={String(option)} label={words} />
      ))}
    </FormSelect>
  );
}

function Row({ children }: { children: ReactNode }) {
  return <div className="vorn-schedule__row">{children}</div>;
}

export function WeekdayFields({ draft, problem, disabled, onChange }: FieldsProps) {
  const toggle = (day: number, on: boolean) =>
    onChange({ days: kDays.filter((other) => (other === day ? on : draft.days.includes(other))) });
  return (
    <FormGroup role="group" label={t('schedule.days')} fieldId="schedule-days">
      <div className="vorn-schedule__days">
        {kDays.map((day) => (
          <Checkbox
            key={day}
            id={`schedule-day-${day}`}
            label={dayName(day)}
            isChecked={draft.days.includes(day)}
            isDisabled={disabled}
            onChange={(_event, on) => toggle(day, on)}
          />
        ))}
        <Button
          variant="link"
          isInline
          isDisabled={disabled}
          onClick={() => onChange({ days: draft.days.length === 7 ? [] : kDays })}
        >
          {draft.days.length === 7 ? t('schedule.days.clear') : t('schedule.days.all')}
        </Button>
      </div>
      <Help id="schedule-days-help" error={problem === 'week_name' && t('schedule.problem.days')} />
    </FormGroup>
  );
}

export function DateFields({ draft, problem, disabled, onChange }: FieldsProps) {
  const day = parseDate(draft.date.replaceAll('-', '/'))?.day ?? 0;
  return (
    <Row>
      <FormGroup label={t('schedule.date')} fieldId="schedule-date">
        <TextInput
          type="date"
          id="schedule-date"
          min="1970-01-01"
          max="9999-12-31"
          value={draft.date}
          isDisabled={disabled}
          validated={problem === 'date' ? 'error' : 'default'}
          aria-describedby="schedule-date-help"
          onChange={(_event, date) => onChange({ date })}
        />
        <Help id="schedule-date-help" error={problem === 'date' && t('schedule.problem.date')} />
      </FormGroup>
      <FormGroup label={t('schedule.repeat')} fieldId="schedule-repeat">
        <NumberSelect
          id="schedule-repeat"
          label={t('schedule.repeat')}
          value={draft.repeat}
          disabled={disabled}
          describedBy="schedule-repeat-help"
          options={[
            [ONCE, t('schedule.repeat.once')],
            [DAILY, t('schedule.repeat.daily')],
            [WEEKLY, t('schedule.repeat.weekly')],
            [MONTHLY, t('schedule.repeat.monthly')],
            [YEARLY, t('schedule.repeat.yearly')],
          ]}
          onChange={(repeat) => onChange({ repeat })}
        />
        <Help
          id="schedule-repeat-help"
          {...(draft.repeat === MONTHLY && day > 28 ? { text: t('schedule.repeat.short') } : {})}
        />
      </FormGroup>
    </Row>
  );
}

export function TimeFields({ draft, problem, disabled, onChange }: FieldsProps) {
  const clock = (hour: number) => [hour, String(hour).padStart(2, '0')] as const;
  // An hour before the first stays to be seen until it is corrected, but can't be chosen.
  const lastHours = kHours.filter((hour) => hour >= draft.hour || hour === draft.last);
  const wrongLast = problem === 'last_work_hour';
  return (
    <>
      <FormGroup role="group" label={t('schedule.time')} fieldId="schedule-hour">
        <div className="vorn-schedule__time">
          <NumberSelect
            id="schedule-hour"
            label={t('schedule.hour')}
            value={draft.hour}
            disabled={disabled}
            options={kHours.map(clock)}
            onChange={(hour) => onChange({ hour })}
          />
          <span aria-hidden="true">:</span>
          <NumberSelect
            id="schedule-minute"
            label={t('schedule.minute')}
            value={draft.min}
            disabled={disabled}
            options={kMinutes.map(clock)}
            onChange={(min) => onChange({ min })}
          />
        </div>
      </FormGroup>
      <Row>
        <FormGroup label={t('schedule.every')} fieldId="schedule-every">
          <NumberSelect
            id="schedule-every"
            label={t('schedule.every')}
            value={draft.every}
            disabled={disabled}
            options={kHours.map((every) => [
              every,
              every === 0 ? t('schedule.every.no') : t('schedule.every.hours', { count: every }),
            ])}
            onChange={(every) => onChange({ every, last: Math.max(draft.last, draft.hour) })}
          />
        </FormGroup>
        {draft.every > 0 && (
          <FormGroup label={t('schedule.last')} fieldId="schedule-last">
            <NumberSelect
              id="schedule-last"
              label={t('schedule.last')}
              value={draft.last}
              disabled={disabled}
              wrong={wrongLast}
              describedBy="schedule-last-help"
              options={lastHours.map((hour) => [hour, clockText(hour, draft.min)])}
              onChange={(last) => onChange({ last })}
            />
            <Help
              id="schedule-last-help"
              error={wrongLast && t('schedule.problem.last', { time: clockText(draft.hour, draft.min) })}
            />
          </FormGroup>
        )}
      </Row>
    </>
  );
}
