import { fireEvent, render, screen, within } from '@testing-library/react';
import userEvent from '@testing-library/user-event';
import { beforeEach, describe, expect, it } from 'vitest';
import type { Overview, Schedule } from '../api/types';
import { imitate, kMember, Refusal, type Handlers } from '../rules/imitated';
import { toSchedule } from '../rules/schedule';
import { draftOf, parametersOf, sameSchedule } from './draft';
import SchedulePage from './SchedulePage';

const kSunday = {
  date: '',
  date_type: 0,
  hour: 3,
  last_work_hour: 0,
  min: 30,
  repeat: 0,
  repeat_hour: 0,
  week_name: '0',
} as const;
let stored: Schedule;
let clock: Overview['clock'];

function overview(): Overview {
  return {
    host_name: 'NAS1',
    computer_account: 'NAS1$',
    last_test: null,
    interfaces: [],
    refresh: null,
    busy: null,
    clock,
  };
}

function show(more: Handlers = {}) {
  const appliance = imitate({
    'domain.get': () => kMember,
    'directory.overview': () => overview(),
    'schedule.get': () => stored,
    'schedule.set': (parameters) => {
      stored =
        parameters.date_type === 2
          ? { date_type: 2 }
          : { ...kSunday, week_name: '', ...parameters, date_type: parameters.date_type };
      return null;
    },
    ...more,
  });
  render(<SchedulePage />);
  return appliance;
}

const words = () => within(screen.getByRole('region', { name: 'The schedule in words' })).getByRole('status');
const save = () => screen.getByRole('button', { name: 'Save' });
const choose = (label: string, option: string) =>
  userEvent.selectOptions(screen.getByRole('combobox', { name: label }), option);

beforeEach(() => {
  stored = { ...kSunday };
  clock = { time: Date.now() / 1000, utc_offset: 0 };
});

describe('the form', () => {
  it('counts the next runs from the time of the appliance, and says it', async () => {
    stored = { ...kSunday, week_name: '0,1,2,3,4,5,6' };
    // A Tuesday of another year, in a zone where it is past the run already.
    clock = { time: Date.UTC(2031, 4, 6, 1, 0) / 1000, utc_offset: 3 * 3600 };
    show();
    const [first] = await screen.findAllByRole('listitem');
    expect(first).toHaveTextContent('Wednesday, May 7, 2031 at 03:30');
    expect(screen.getByText(/its own clock, which shows Tuesday, May 6, 2031 at 04:00\.$/)).toBeVisible();
  });

  it('shows what is stored, in words and with its next runs', async () => {
    show();
    expect(await screen.findByRole('radio', { name: 'On days of the week' })).toBeChecked();
    expect(screen.getByRole('checkbox', { name: 'Sunday' })).toBeChecked();
    expect(screen.getByRole('checkbox', { name: 'Monday' })).not.toBeChecked();
    expect(words()).toHaveTextContent('Every Sunday at 03:30.');
    const runs = screen.getAllByRole('listitem');
    expect(runs).toHaveLength(3);
    runs.forEach((run) => expect(run).toHaveTextContent(/^Sunday, .* at 03:30$/));
    expect(save()).toHaveAttribute('aria-disabled', 'true');
  });

  it('follows each change in words and sends it', async () => {
    const appliance = show();
    await userEvent.click(await screen.findByRole('checkbox', { name: 'Wednesday' }));
    await choose('Hour', '08');
    await choose('Minute', '05');
    await choose('Again on the same day', 'Every 4 hours');
    await choose('Not later than', '17:05');
    expect(words()).toHaveTextContent(
      'Every Sunday and Wednesday at 08:05 and every 4 hours from then to 16:05.',
    );
    expect(screen.getByText('Stored: Every Sunday at 03:30.')).toBeInTheDocument();
    await userEvent.click(save());
    expect(await screen.findByText('Saved.')).toBeInTheDocument();
    expect(appliance.of('schedule.set').map((call) => call.parameters)).toEqual([
      { date_type: 0, week_name: '0,3', hour: 8, min: 5, repeat_hour: 4, last_work_hour: 17 },
    ]);
  });

  it('refuses a week without days', async () => {
    const appliance = show();
    await userEvent.click(await screen.findByRole('checkbox', { name: 'Sunday' }));
    expect(screen.getByText('Choose at least one day.')).toBeInTheDocument();
    expect(words()).toHaveTextContent('The schedule is not complete.');
    await userEvent.click(save());
    expect(appliance.of('schedule.set')).toHaveLength(0);
  });

  it('refuses a last run before the first', async () => {
    const appliance = show();
    stored = { ...kSunday };
    await screen.findByRole('checkbox', { name: 'Sunday' });
    await choose('Again on the same day', 'Every 2 hours');
    await choose('Not later than', '17:30');
    await choose('Hour', '20');
    expect(screen.getByText(/before the first run at 20:30/)).toBeInTheDocument();
    await userEvent.click(save());
    expect(appliance.of('schedule.set')).toHaveLength(0);
    await choose('Not later than', '22:30');
    expect(words()).toHaveTextContent('Every Sunday at 20:30 and every 2 hours from then to 22:30.');
  });

  it('refuses a date that is none, and warns of one that has passed', async () => {
    const appliance = show();
    await userEvent.click(await screen.findByRole('radio', { name: 'From a date on' }));
    const date = screen.getByLabelText('First day');
    fireEvent.change(date, { target: { value: '' } });
    expect(screen.getByText(/Choose a day that exists/)).toBeInTheDocument();
    await userEvent.click(save());
    expect(appliance.of('schedule.set')).toHaveLength(0);
    fireEvent.change(date, { target: { value: '2020-01-31' } });
    await choose('Repeat', 'Once, on this day only');
    expect(screen.getByText(/it will never run/)).toBeInTheDocument();
    await choose('Repeat', 'Every month');
    expect(words()).toHaveTextContent(
      'Every month on day 31, or its last one, from 2020/01/31 on, at 03:30.',
    );
    await userEvent.click(save());
    expect(await screen.findByText('Saved.')).toBeInTheDocument();
    expect(appliance.of('schedule.set')[0]?.parameters).toEqual({
      date_type: 1,
      date: '2020/01/31',
      repeat: 3,
      hour: 3,
      min: 30,
      repeat_hour: 0,
      last_work_hour: 0,
    });
  });

  it('removes the schedule', async () => {
    const appliance = show();
    await userEvent.click(await screen.findByRole('radio', { name: 'By hand only' }));
    expect(screen.getByText('Saving removes the schedule that is stored.')).toBeInTheDocument();
    await userEvent.click(save());
    expect(await screen.findByText('Saved.')).toBeInTheDocument();
    expect(appliance.of('schedule.set')[0]?.parameters).toEqual({ date_type: 2 });
    expect(words()).toHaveTextContent('There is no schedule');
  });

  it('asks when another schedule was stored meanwhile', async () => {
    const appliance = show();
    await choose0();
    stored = { ...kSunday, week_name: '5' };
    await userEvent.click(save());
    expect(await screen.findByText('Stored is now: Every Friday at 03:30.')).toBeInTheDocument();
    expect(appliance.of('schedule.set')).toHaveLength(0);
    await userEvent.click(screen.getByRole('button', { name: 'Load what is stored' }));
    expect(words()).toHaveTextContent('Every Friday at 03:30.');
  });

  it('keeps its own schedule when that is chosen', async () => {
    show();
    await choose0();
    stored = { ...kSunday, week_name: '5' };
    await userEvent.click(save());
    await userEvent.click(await screen.findByRole('button', { name: 'Keep what is entered here' }));
    await userEvent.click(save());
    expect(await screen.findByText('Saved.')).toBeInTheDocument();
    expect(stored).toMatchObject({ week_name: '0,1' });
  });

  const choose0 = async () => userEvent.click(await screen.findByRole('checkbox', { name: 'Monday' }));
});

describe('without a membership', () => {
  it('leads to the join instead', async () => {
    stored = { date_type: 2 };
    show({ 'domain.get': () => ({ enable_domain: false }) });
    expect(await screen.findByRole('link', { name: 'Join a domain' })).toHaveAttribute('href', '#/join');
  });

  it('is noticed when it ends before a save', async () => {
    const appliance = show();
    await userEvent.click(await screen.findByRole('checkbox', { name: 'Monday' }));
    appliance.handlers['schedule.set'] = () => {
      appliance.handlers['domain.get'] = () => ({ enable_domain: false });
      return new Refusal(2624);
    };
    await userEvent.click(save());
    expect(await screen.findByRole('heading', { name: 'No member of a domain' })).toBeInTheDocument();
  });
});

describe('a draft', () => {
  it('compares what counts', () => {
    const schedule = toSchedule({ ...kSunday, week_name: '6,0,0' });
    expect(
      sameSchedule(schedule, toSchedule({ ...kSunday, week_name: '0,6', date: 'soon', last_work_hour: 9 })),
    ).toBe(true);
    expect(sameSchedule(schedule, toSchedule({ ...kSunday, week_name: '0' }))).toBe(false);
    const dated = toSchedule({ date_type: 1, date: '2031/5/7', repeat: 1, hour: 3, min: 30 });
    expect(sameSchedule(dated, toSchedule({ ...dated, date: '2031/05/07' }))).toBe(true);
    expect(sameSchedule(dated, toSchedule({ ...dated, repeat: 2 }))).toBe(false);
  });

  it('of what is stored asks for the same', () => {
    for (const schedule of [
      toSchedule({ ...kSunday, repeat_hour: 3, last_work_hour: 20 }),
      toSchedule({ date_type: 1, date: '2031/5/7', repeat: 0, hour: 0, min: 0 }),
      toSchedule({ date_type: 2 }),
    ]) {
      expect(sameSchedule(toSchedule({ ...parametersOf(draftOf(schedule, '2026-11-22')) }), schedule)).toBe(
        true,
      );
    }
  });
});
